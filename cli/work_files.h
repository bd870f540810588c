// What commands on several files share: jobs, the progress line, errors named by their file.
#pragma once

#include <functional>
#include <string>
#include <vector>

#include "cli/audio_source.h"
#include "cli/progress.h"
#include "cli/turns.h"

namespace orvalis::cli {

/// Hears after every piece how far an input is.
using Advanced = std::function<void(const Advance &)>;

/// How far `source` is, that was opened at `began`.
Advance advance_of(const std::string &name, const AudioSource &source,
                   Progress::Clock::time_point began);

struct WorkSettings {
  std::size_t jobs = 1;
  bool progress = true;  ///< A line on standard error if that is a terminal
};

/// Does `work` on every input, several at once. What it prints goes through its turn; an AudioError
/// or OutputError that it throws is printed, and the other inputs are done all the same. Returns
/// the exit status. With standard input among the inputs, Ctrl-C ends the input and not the tool.
int work_files(
    const std::vector<std::string> &inputs, const WorkSettings &settings,
    const std::function<void(std::size_t job, Turn &turn, const Advanced &advanced)> &work);

}  // namespace orvalis::cli
