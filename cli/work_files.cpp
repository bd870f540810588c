#include "cli/work_files.h"

#include <algorithm>
#include <chrono>
#include <csignal>
#include <stdexcept>

#include "cli/output_file.h"
#include "cli/report.h"

namespace orvalis::cli {
namespace {

/// Ctrl-C ends whoever writes into the pipe as well: what was said last is then still worked on, at
/// the end of the input. A second Ctrl-C ends the tool.
void outlive_one_interrupt() {
  std::signal(SIGINT, [](int) { std::signal(SIGINT, SIG_DFL); });
}

}  // namespace

Advance advance_of(const std::string &name, const AudioSource &source,
                   Progress::Clock::time_point began) {
  const std::chrono::duration<double> elapsed = Progress::Clock::now() - began;
  return {name, static_cast<double>(source.samples_read()) / source.rate_hz(),
          source.length_seconds(), elapsed.count()};
}

int work_files(
    const std::vector<std::string> &inputs, const WorkSettings &settings,
    const std::function<void(std::size_t job, Turn &turn, const Advanced &advanced)> &work) {
  if (std::ranges::count(inputs, "-") > 0) outlive_one_interrupt();
  int status = 0;
  Progress progress;
  run_in_turn(inputs.size(), settings.jobs, [&](std::size_t job, Turn &turn) {
    const std::string &name = inputs[job];
    const auto show = [&](const Advance &advance) {
      if (turn.has_come() && settings.progress) progress.update(advance);
    };
    const auto fail = [&](const std::exception &error) {
      turn.act([&name, &status, message = std::runtime_error(error.what())] {
        print_input_error(name, message);
        status = 1;
      });
    };
    try {
      work(job, turn, show);
    } catch (const AudioError &error) {
      fail(error);
    } catch (const OutputError &error) {
      fail(error);
    }
  });
  return status;
}

}  // namespace orvalis::cli
