#include "cli/jobs.h"

#include <algorithm>
#include <atomic>
#include <exception>
#include <mutex>
#include <new>
#include <thread>
#include <utility>

#include "cli/audio_file.h"
#include "cli/signals.h"

namespace orvalis::cli {
/// Actions of jobs that run at the same time, performed in the order of the jobs.
class Turns {
public:
  /// Ends a job after the failure of another one.
  struct Abandoned {};

  explicit Turns(std::size_t count) : jobs_(count) {}

  void act(std::size_t job, std::function<void()> action) {
    const std::lock_guard lock(mutex_);
    if (job == current_) {
      perform(action);
    } else {
      jobs_[job].waiting.push_back(std::move(action));
    }
    if (failure_) throw Abandoned();
  }

  /// Whether all jobs before this one have ended. Until it ends itself, no other job acts.
  bool has_come(std::size_t job) {
    const std::lock_guard lock(mutex_);
    if (failure_) throw Abandoned();
    return job == current_;
  }

  void end(std::size_t job) {
    const std::lock_guard lock(mutex_);
    jobs_[job].ended = true;
    while (current_ < jobs_.size() && jobs_[current_].ended) {
      ++current_;
      if (current_ == jobs_.size()) return;
      for (const auto &action : std::exchange(jobs_[current_].waiting, {})) perform(action);
    }
  }

  void rethrow_failure() const {
    if (failure_) std::rethrow_exception(failure_);
  }

private:
  struct Waiting {
    std::vector<std::function<void()>> waiting;
    bool ended = false;
  };

  void perform(const std::function<void()> &action) {
    if (failure_) return;
    try {
      action();
    } catch (...) {
      failure_ = std::current_exception();
    }
  }

  std::mutex mutex_;
  std::size_t current_ = 0;
  std::vector<Waiting> jobs_;
  std::exception_ptr failure_;
};

Job::Job(std::string input, std::size_t number, Turns &turns, Console &console)
    : input_(std::move(input)),
      number_(number),
      turns_(turns),
      console_(console),
      start_(std::chrono::steady_clock::now()) {}

void Job::in_turn(std::function<void()> action) { turns_.act(number_, std::move(action)); }

void Job::note(const std::string &text) {
  in_turn([&console = console_, input = input_, text] { console.print_note(input, text); });
}

void Job::print_error(const std::string &text) {
  in_turn([&console = console_, input = input_, text] { console.print_error(input, text); });
}

void Job::show_progress(double processed_s, std::optional<double> length_s) {
  if (!turns_.has_come(number_)) return;
  const std::chrono::duration<double> elapsed = std::chrono::steady_clock::now() - start_;
  console_.show_progress({input_, processed_s, length_s, elapsed.count()});
}

void ReportInTurn::begin_file(const std::string &name, int rate_hz, Reported reported) {
  job_.in_turn([=, &report = report_] { report.begin_file(name, rate_hz, reported); });
}

void ReportInTurn::utterance(const Utterance &found) {
  job_.in_turn([=, &report = report_] { report.utterance(found); });
}

void ReportInTurn::silence(const Silence &found) {
  job_.in_turn([=, &report = report_] { report.silence(found); });
}

void ReportInTurn::frame(std::int64_t number, int decision) {
  job_.in_turn([=, &report = report_] { report.frame(number, decision); });
}

void ReportInTurn::trace(std::int64_t number, double start_s, const Trace &values) {
  job_.in_turn([=, &report = report_] { report.trace(number, start_s, values); });
}

void ReportInTurn::statistics(const Statistics &values) {
  job_.in_turn([=, &report = report_] { report.statistics(values); });
}

void ReportInTurn::end_file(std::int64_t samples) {
  job_.in_turn([=, &report = report_] { report.end_file(samples); });
}

int process_files(const std::vector<std::string> &inputs, std::size_t threads, Console &console,
                  const std::function<void(Job &job)> &process) {
  if (std::ranges::count(inputs, "-") > 0) survive_one_interrupt();
  int status = 0;  // changed in turn only
  Turns turns(inputs.size());
  const auto run = [&](Job &job) {
    try {
      process(job);
    } catch (const AudioError &error) {
      job.print_error(error.what());
      job.in_turn([&status] { status = 1; });
    } catch (const std::bad_alloc &) {
      job.print_error("out of memory");
      job.in_turn([&status] { status = 1; });
    } catch (const Turns::Abandoned &) {
      throw;
    } catch (...) {
      job.in_turn([failure = std::current_exception()] { std::rethrow_exception(failure); });
    }
  };
  std::atomic<std::size_t> next{0};
  const auto work = [&] {
    try {
      for (std::size_t number = next++; number < inputs.size(); number = next++) {
        Job job(inputs[number], number, turns, console);
        run(job);
        turns.end(number);
      }
    } catch (const Turns::Abandoned &) {
      // The failure itself is thrown once all threads have ended.
    }
  };
  {
    std::vector<std::jthread> helpers;
    for (std::size_t i = 1; i < std::min(threads, inputs.size()); ++i) helpers.emplace_back(work);
    work();
  }
  turns.rethrow_failure();
  return status;
}

}  // namespace orvalis::cli
