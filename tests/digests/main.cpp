// Runs the digests with the bodies of one instruction set: --body=portable, sse2, avx2 or neon.
// Ends with 77 on a processor that lacks it. Without the option, with the best there is.
#include <gtest/gtest.h>

#include <cstdio>
#include <string_view>

#include "Voice_Engine/bodies/services.h"

int main(int argc, char **argv) {
  using orvalis::InstructionSet;
  testing::InitGoogleTest(&argc, argv);
  if (argc > 1) {
    const std::string_view body = argv[1];
    const InstructionSet set = body == "--body=sse2"   ? InstructionSet::kSse2
                               : body == "--body=avx2" ? InstructionSet::kAvx2
                               : body == "--body=neon" ? InstructionSet::kNeon
                                                       : InstructionSet::kPortable;
    if (!orvalis::has_instruction_set(set)) {
      std::printf("%s: not this processor\n", argv[1]);
      return 77;
    }
    orvalis::use_instruction_set(set);
  }
  return RUN_ALL_TESTS();
}
