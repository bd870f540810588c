// Jobs that run at once and act in order.
#pragma once

#include <cstddef>
#include <functional>

namespace orvalis::cli {

class Turns;

/// A job's place in the order.
class Turn {
public:
  Turn(Turns &turns, std::size_t job) : turns_(turns), job_(job) {}

  /// Acts at once if the jobs before have ended, else as soon as they have.
  void act(std::function<void()> action);

  /// Whether the jobs before have ended: no other job acts until this one ends.
  bool has_come() const;

private:
  Turns &turns_;
  std::size_t job_;
};

/// Runs jobs 0 to `count` - 1 on up to `threads` threads. To whoever sees what they do by way of
/// their turns it looks as if one came after the other. The first exception in that order, of a job
/// or an action, ends everything and is thrown here.
void run_in_turn(std::size_t count, std::size_t threads,
                 const std::function<void(std::size_t job, Turn &turn)> &run);

}  // namespace orvalis::cli
