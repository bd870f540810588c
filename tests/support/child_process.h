// A program under test as a child process: standard input from the test, both outputs kept.
#pragma once

#include <sys/wait.h>

#include <chrono>
#include <cstdio>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <stdexcept>
#include <string>
#include <string_view>
#include <thread>
#include <utility>

namespace orvalis::test {

inline std::string read_file(const std::filesystem::path &path) {
  std::ifstream file(path, std::ios::binary);
  return {std::istreambuf_iterator<char>(file), {}};
}

class ChildProcess {
public:
  /// Runs a shell command line; its outputs are kept in files in `folder`.
  ChildProcess(const std::string &command, std::filesystem::path folder)
      : folder_(std::move(folder)) {
    const std::string line = "{ " + command + "\n} >'" + out_path() + "' 2>'" + err_path() + "'";
    input_ = popen(line.c_str(), "w");
    if (!input_) throw std::runtime_error("popen failed");
  }
  ~ChildProcess() { finish(); }
  ChildProcess(const ChildProcess &) = delete;
  ChildProcess &operator=(const ChildProcess &) = delete;

  /// Writes to the child's standard input, which stays open.
  void write(const std::string &bytes) {
    std::fwrite(bytes.data(), 1, bytes.size(), input_);
    std::fflush(input_);
  }

  /// Whether the child prints `text` within some seconds, while it still runs.
  bool prints(std::string_view text) const {
    for (int tries = 0; tries < 1000; ++tries) {
      if (output().find(text) != std::string::npos) return true;
      std::this_thread::sleep_for(std::chrono::milliseconds(10));
    }
    return false;
  }

  /// Ends the input, waits, and returns the exit status; -1 if a signal ended the child.
  int finish() {
    if (input_) {
      const int status = pclose(std::exchange(input_, nullptr));
      exit_status_ = WIFEXITED(status) ? WEXITSTATUS(status) : -1;
    }
    return exit_status_;
  }

  std::string output() const { return read_file(out_path()); }
  std::string errors() const { return read_file(err_path()); }

private:
  std::string out_path() const { return folder_ / "stdout"; }
  std::string err_path() const { return folder_ / "stderr"; }

  std::filesystem::path folder_;
  std::FILE *input_ = nullptr;
  int exit_status_ = -1;
};

}  // namespace orvalis::test
