// Everything that a caller can observe, folded into digests and compared with a file for each
// service: the same on every processor, with every compiler and optimisation.
//
// docs/digests.md says how to write the files again, and when that is allowed.
#pragma once

#include <gtest/gtest.h>

#include <bit>
#include <cmath>
#include <concepts>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <fstream>
#include <map>
#include <string>
#include <utility>

namespace orvalis::test {

/// Judges one service, sequence by sequence, call by call. The digest runs on through a sequence,
/// so that the last one covers all of it; two hexadecimal digits of each call show where two runs
/// differ first.
class Judge {
public:
  explicit Judge(const std::string &service) : service_(service) {
    // A call that ends the process with status 0 would pass for a success.
    static const int registered = std::atexit([] {
      if (is_judging) std::_Exit(1);
    });
    is_judging = registered == 0;
    if (const char *folder = std::getenv("ORVALIS_WRITE_DIGESTS"))
      written_.open(std::string(folder) + "/" + service + ".txt");
    std::ifstream file(std::string(ORVALIS_DIGESTS "/") + service + ".txt");
    std::string name, total, line;
    for (std::size_t digits = 0; file >> name >> total >> digits;) {
      Sequence &read = expected_[name] = {total, ""};
      while (read.calls.size() < digits && file >> line) read.calls += line;
    }
  }
  Judge(const Judge &) = delete;
  Judge &operator=(const Judge &) = delete;
  ~Judge() {
    is_judging = false;
    if (written_.is_open()) {
      EXPECT_TRUE(written_.flush());
      return;
    }
    for (const auto &[name, sequence] : expected_)
      ADD_FAILURE() << service_ << ", " << name << ": not run";
  }

  /// Cleared by a child process whose end is itself judged.
  static inline bool is_judging = false;

  /// Folds numbers, or arrays, vectors and strings of them, into the digest of the running call.
  template <class... Values>
  void take(const Values &...values) {
    (take_one(values), ...);
  }

  /// Ends a call. `what` describes it if it is the first one to differ.
  void call(const std::string &what = {}) {
    char digits[3];
    std::snprintf(digits, sizeof digits, "%02x", static_cast<unsigned>(digest_ >> 56));
    const std::size_t at = ran_.calls.size();
    ran_.calls += digits;
    if (!first_difference_.empty()) return;
    const std::string &expected = expected_[name_].calls;
    if (at >= expected.size() || expected.compare(at, 2, digits) != 0)
      first_difference_ = "call " + std::to_string(at / 2) + " differs first " + what;
  }

  /// Runs `body`, which takes values and ends calls, as a sequence of its own.
  template <class Body>
  void sequence(const std::string &name, Body body) {
    name_ = name;
    digest_ = 0;
    ran_ = {};
    first_difference_.clear();
    body();
    char digits[17];
    std::snprintf(digits, sizeof digits, "%016llx", static_cast<unsigned long long>(digest_));
    ran_.total = digits;
    if (written_.is_open()) {
      write();
    } else if (const Sequence expected = std::exchange(expected_[name], {}); expected != ran_) {
      ADD_FAILURE() << service_ << ", " << name << ": "
                    << (expected.total.empty()       ? "no digests to hold it against"
                        : !first_difference_.empty() ? first_difference_
                                                     : "too few calls, or none tells where");
    }
    expected_.erase(name);
  }

private:
  struct Sequence {
    std::string total;
    std::string calls;
    bool operator==(const Sequence &) const = default;
  };

  template <class Value>
  void take_one(const Value &value) {
    if constexpr (std::floating_point<Value>) {
      // Which not-a-number an operation gives is the processor's choice.
      if (std::isnan(value)) return mix(0x7FF8'0000'0000'0000);
      mix(std::bit_cast<std::conditional_t<sizeof value == 4, std::uint32_t, std::uint64_t>>(
          value));
    } else if constexpr (requires { std::begin(value); }) {
      for (const auto &element : value) take_one(element);
    } else {
      mix(static_cast<std::uint64_t>(value));
    }
  }

  void mix(std::uint64_t value) {
    digest_ = (digest_ ^ value) * 0x9E3779B97F4A7C15 + 1;
    digest_ ^= digest_ >> 29;
  }

  void write() {
    constexpr std::size_t kLine = 80;
    written_ << name_ << ' ' << ran_.total << ' ' << ran_.calls.size() << '\n';
    for (std::size_t at = 0; at < ran_.calls.size(); at += kLine)
      written_ << ran_.calls.substr(at, kLine) << '\n';
  }

  std::string service_;
  std::map<std::string, Sequence> expected_;
  std::ofstream written_;
  std::string name_;
  std::uint64_t digest_ = 0;
  Sequence ran_;
  std::string first_difference_;
};

}  // namespace orvalis::test
