// What a service shows beside its results: the flags of all operators, its log lines, its dump
// files, and what it prints before it ends the process. Handle numbers in lines and names count as
// '#'. And how audio is passed to it.
#pragma once

#include <sys/wait.h>
#include <unistd.h>

#include <array>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <map>
#include <stdexcept>
#include <string>

#include "Voice_Engine/ns/s1chns.h"
#include "Voice_Engine/platform/dump_file.h"
#include "jni/orvalis.h"
#include "tests/digests/hostile.h"
#include "tests/digests/judge.h"
#include "tests/support/child_process.h"
#include "tests/support/flag_words.h"
#include "tests/support/scripted_malloc.h"
#include "tests/support/temporary_folder.h"

namespace orvalis::test {

/// What a call prints, and how the process ends that makes it.
template <class Call>
std::string last_words(Call call) {
  std::fflush(stdout);  // or the child repeats what is still buffered
  int ends[2];
  if (pipe(ends) != 0) throw std::runtime_error("no pipe");
  const pid_t child = fork();
  if (child == 0) {
    Judge::is_judging = false;
    dup2(ends[1], STDOUT_FILENO);
    dup2(ends[1], STDERR_FILENO);
    call();
    std::puts("returned");
    std::exit(77);
  }
  close(ends[1]);
  std::string words;
  for (char letter; read(ends[0], &letter, 1) == 1;) words += letter;
  close(ends[0]);
  int status = 0;
  waitpid(child, &status, 0);
  return words + std::to_string(WIFEXITED(status) ? WEXITSTATUS(status) : -1);
}

template <class Call>
auto without_memory(Call call) {
  const auto exhausted = ScriptedMalloc::failing();
  return call();
}

/// How a sequence makes its calls: at random where it is hostile.
struct Caller {
  explicit Caller(std::uint64_t seed, bool is_hostile = true) : random(seed), hostile(is_hostile) {}
  Random random;
  bool hostile;
};

inline void take_record(Judge &judge, const S1chnsState &ns) {
  judge.take(ns.frame_cnt, ns.first_frame, ns.gain_slope_q15, ns.init_mode, ns.pre_emp_mem,
             ns.de_emp_mem, ns.update_cnt, ns.hyster_cnt, ns.last_update_cnt, ns.ch_enrg_long_db,
             ns.min_gain_q21, ns.synthesis_overlap, ns.bin_gain_q15, ns.analysis_overlap,
             ns.ch_enrg, ns.ch_noise, ns.prev_shift);
}

class Observer {
public:
  explicit Observer(Judge &judge) : judge_(judge) {
    std::filesystem::create_directories(folder_.path() / "sdcard/VRpreprocess");
    if (SetDumpRoot(folder_.path().c_str()) != 0) throw std::runtime_error("no dump root");
    SetLogSink(
        [](int priority, const char *tag, const char *text, void *self) {
          static_cast<Observer *>(self)->lines_ +=
              std::to_string(priority) + '/' + tag + ": " + text + '\n';
        },
        this);
    write_flags({});
  }
  ~Observer() {
    SetLogSink(nullptr, nullptr);
    SetDumpRoot(nullptr);
  }
  Observer(const Observer &) = delete;
  Observer &operator=(const Observer &) = delete;

  /// The instance whose number is a handle's.
  void watch(const void *handle) { number_ = std::to_string(handle_number(handle)); }

  /// Passes frame after frame, one at a time; or, if the caller is hostile, chunks of any size, and
  /// refused calls for the first of 64 oddities. `process` gets oddity, samples and their count,
  /// and returns the answer; `take_record` follows every call. Behind the count are samples to
  /// `room`.
  template <class Process, class TakeRecord>
  void drive(const Pcm &audio, Caller &caller, std::size_t room, std::int32_t frame, int refusals,
             Process process, TakeRecord take_record) {
    auto &[random, hostile] = caller;
    for (std::size_t at = 0; at + room <= audio.size();) {
      Pcm samples = cut(audio, at, room);
      std::int32_t count = frame;
      const auto oddity = hostile ? draw(random, 0, 63) : 63;
      if (hostile) disturb_flags(random);
      if (oddity >= refusals && oddity < 10) count *= static_cast<std::int32_t>(draw(random, 2, 7));
      if (oddity == 10) count += static_cast<std::int32_t>(draw(random, 1, 3 * count));
      judge_.take(process(oddity, samples, count), samples);
      if (oddity >= refusals) at += static_cast<std::size_t>(count / frame * frame);
      take_record();
      call();
    }
  }

  /// Sometimes leaves values in the flags that no operator would, as a host may.
  void disturb_flags(Random &random) {
    if (draw(random, 0, 7) != 0) return;
    FlagWords words;
    words.fill(pick(random, {0, 1, 7}));
    write_flags(words);
  }

  /// Ends a call: flags and lines join what the service has taken.
  void call() {
    judge_.take(read_flags(), anonymous(lines_));
    lines_.clear();
    judge_.call();
  }

  /// Takes the names and contents of all dump files and removes them; also whether files were left
  /// open.
  void take_dumps() {
    judge_.take(open_files() - opened_before_);
    std::map<std::string, Pcm> dumps;
    for (const auto &file :
         std::filesystem::recursive_directory_iterator(folder_.path() / "sdcard")) {
      if (!file.is_regular_file()) continue;
      const std::string bytes = read_file(file.path());
      Pcm &samples = dumps[anonymous(file.path().lexically_relative(folder_.path()))];
      samples.resize(bytes.size() / sizeof samples[0]);
      std::memcpy(samples.data(), bytes.data(), bytes.size());
      std::filesystem::remove(file.path());
    }
    for (const auto &[name, samples] : dumps) judge_.take(name, samples);
    call();
  }

private:
  static std::ptrdiff_t open_files() {
    return std::distance(std::filesystem::directory_iterator("/proc/self/fd"), {});
  }

  std::string anonymous(std::string text) const {
    for (std::size_t at = 0; (at = text.find(number_, at)) != std::string::npos;)
      text.replace(at, number_.size(), "#");
    return text;
  }

  Judge &judge_;
  TemporaryFolder folder_;
  std::ptrdiff_t opened_before_ = open_files();
  std::string lines_;
  std::string number_ = "no number";
};

}  // namespace orvalis::test
