// Everything that a caller can observe, folded into digests and compared with a file for each
// service: the same on every processor, with every compiler and optimisation.
//
// docs/digests.md says how to write the files again, and when that is allowed.
#pragma once

#include <gtest/gtest.h>

#include <algorithm>
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
#include <vector>

namespace orvalis::test {

/// Judges one service, sequence by sequence, call by call. The digest runs on through a sequence,
/// so that the last one covers all of it; two hexadecimal digits of each call show where two runs
/// differ first.
class Judge {
public:
  explicit Judge(const std::string &service) : service_(service) {
    // A call that ends the process with status 0 would pass for a success.
    is_judging = std::atexit([] {
                   if (is_judging) std::_Exit(1);
                 }) == 0;
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
    ran_.calls += hexadecimal(digest_ >> 56, 2);
    described_.push_back(what);
  }

  /// Runs `body`, which takes values and ends calls, as a sequence of its own.
  template <class Body>
  void sequence(const std::string &name, Body body) {
    digest_ = 0;
    ran_ = {};
    described_.clear();
    body();
    ran_.total = hexadecimal(digest_, 16);
    const Sequence expected = std::exchange(expected_[name], {});
    expected_.erase(name);
    if (written_.is_open()) {
      write(name);
    } else if (expected != ran_) {
      const auto differs = std::ranges::mismatch(ran_.calls, expected.calls).in1;
      const auto call = static_cast<std::size_t>(differs - ran_.calls.begin()) / 2;
      ADD_FAILURE() << service_ << ", " << name << ": "
                    << (expected.total.empty() ? "no digests to hold it against"
                        : call < described_.size()
                            ? "call " + std::to_string(call) + " differs first " + described_[call]
                            : "too few calls, or none tells where");
    }
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

  static std::string hexadecimal(std::uint64_t value, int digits) {
    char text[17];
    std::snprintf(text, sizeof text, "%0*llx", digits, static_cast<unsigned long long>(value));
    return text;
  }

  void write(const std::string &name) {
    constexpr std::size_t kLine = 80;
    written_ << name << ' ' << ran_.total << ' ' << ran_.calls.size() << '\n';
    for (std::size_t at = 0; at < ran_.calls.size(); at += kLine)
      written_ << ran_.calls.substr(at, kLine) << '\n';
  }

  std::string service_;
  std::map<std::string, Sequence> expected_;
  std::ofstream written_;
  std::uint64_t digest_ = 0;
  Sequence ran_;
  std::vector<std::string> described_;
};

}  // namespace orvalis::test
