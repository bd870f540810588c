// The signals that end the tool: INT, TERM and HUP.
#pragma once

namespace orvalis::cli {

/// From now on such a signal first removes unfinished files, then ends the process as it would have
/// done. Signals that the process was started to ignore stay ignored. To be called before other
/// threads are started.
void watch_signals();

/// The next INT is survived: Ctrl-C also ends the program that writes into our pipe, and what it
/// wrote last is still processed, up to the end of the input.
void survive_one_interrupt();

}  // namespace orvalis::cli
