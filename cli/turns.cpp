#include "cli/turns.h"

#include <algorithm>
#include <atomic>
#include <exception>
#include <mutex>
#include <thread>
#include <utility>
#include <vector>

namespace orvalis::cli {

class Turns {
public:
  /// Leaves a job when another has failed.
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
  struct Job {
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
  std::vector<Job> jobs_;
  std::exception_ptr failure_;
};

void Turn::act(std::function<void()> action) { turns_.act(job_, std::move(action)); }

bool Turn::has_come() const { return turns_.has_come(job_); }

void run_in_turn(std::size_t count, std::size_t threads,
                 const std::function<void(std::size_t job, Turn &turn)> &run) {
  Turns turns(count);
  std::atomic<std::size_t> next{0};
  const auto work = [&] {
    try {
      for (std::size_t job = next++; job < count; job = next++) {
        Turn turn(turns, job);
        try {
          run(job, turn);
        } catch (const Turns::Abandoned &) {
          throw;
        } catch (...) {
          turn.act([failure = std::current_exception()] { std::rethrow_exception(failure); });
        }
        turns.end(job);
      }
    } catch (const Turns::Abandoned &) {
      // Whoever waits for the threads learns why.
    }
  };
  {
    std::vector<std::jthread> helpers;
    for (std::size_t i = 1; i < std::min(threads, count); ++i) helpers.emplace_back(work);
    work();
  }
  turns.rethrow_failure();
}

}  // namespace orvalis::cli
