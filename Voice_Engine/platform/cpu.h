// The instruction sets that the engine has bodies for, and those that this processor offers.
#pragma once

namespace orvalis {

enum class InstructionSet { kPortable, kSse2, kAvx2, kNeon };

/// Whether this library holds bodies for a set and the processor, as the system runs it, has it.
bool has_instruction_set(InstructionSet set);

/// The fastest of them.
InstructionSet best_instruction_set();

}  // namespace orvalis
