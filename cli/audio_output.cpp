#include "cli/audio_output.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <array>
#include <cerrno>
#include <string_view>
#include <system_error>
#include <vector>

#include "cli/output_file.h"
#include "cli/output_formats.h"

namespace orvalis::cli {
namespace {

/// Where standard output led before it was reserved.
int standard_output = STDOUT_FILENO;

class WholeFile : public AudioOutput {
public:
  WholeFile(const std::string &name, const OutputFormat &format, bool replace)
      : file_(name, format, replace) {}

  void write(std::span<const std::int16_t> samples) override { file_.write(samples); }
  void commit() override { file_.commit(); }

private:
  OutputFile file_;
};

/// The header of WAV whose length nobody knows yet, which libsndfile does not write: the greatest
/// possible stands for it, as with other tools that stream.
std::array<char, 44> wav_header(int rate_hz) {
  std::array<char, 44> header{};
  std::size_t at = 0;
  const auto put = [&](std::uint32_t value, int bytes) {
    for (int i = 0; i < bytes; ++i) header[at++] = static_cast<char>(value >> (8 * i));
  };
  const auto put_name = [&](std::string_view name) {
    for (const char c : name) header[at++] = c;
  };
  constexpr std::uint32_t kOpen = 0xffffffff, kPcm = 1, kChannels = 1, kBytes = 2;
  const auto rate = static_cast<std::uint32_t>(rate_hz);
  put_name("RIFF");
  put(kOpen, 4);
  put_name("WAVEfmt ");
  put(16, 4);
  put(kPcm, 2);
  put(kChannels, 2);
  put(rate, 4);
  put(rate * kBytes, 4);
  put(kBytes, 2);
  put(8 * kBytes, 2);
  put_name("data");
  put(kOpen, 4);
  return header;
}

class Streamed : public AudioOutput {
public:
  Streamed(const std::string &name, const std::string &format, int rate_hz)
      : name_(name),
        descriptor_(name == "-" ? standard_output : open(name.c_str(), O_WRONLY | O_CLOEXEC)) {
    if (descriptor_ < 0) fail();
    if (format == "wav") {
      const auto header = wav_header(rate_hz);
      write_bytes(header.data(), header.size());
    }
  }
  ~Streamed() override {
    if (name_ != "-" && descriptor_ >= 0) close(descriptor_);
  }
  Streamed(const Streamed &) = delete;
  Streamed &operator=(const Streamed &) = delete;

  void write(std::span<const std::int16_t> samples) override {
    bytes_.clear();
    for (const std::int16_t sample : samples) {
      bytes_.push_back(static_cast<char>(sample & 0xff));
      bytes_.push_back(static_cast<char>(sample >> 8));
    }
    write_bytes(bytes_.data(), bytes_.size());
  }

  void commit() override {
    // Some devices tell of a failure only now.
    const int last = descriptor_;
    descriptor_ = -1;
    if (close(last) != 0) fail();
  }

private:
  void write_bytes(const char *bytes, std::size_t count) {
    while (count > 0) {
      const ssize_t written = ::write(descriptor_, bytes, count);
      if (written < 0 && errno == EINTR) continue;
      if (written < 0) fail();
      bytes += written;
      count -= static_cast<std::size_t>(written);
    }
  }

  [[noreturn]] void fail() const {
    const std::error_code error(errno, std::generic_category());
    if (name_ == "-") throw std::system_error(error, "standard output");
    throw OutputError(name_ + ": " + error.message());
  }

  std::string name_;
  int descriptor_;
  std::vector<char> bytes_;
};

}  // namespace

bool is_streamed(const std::string &name) {
  struct stat status;
  return name == "-" ||
         (stat(name.c_str(), &status) == 0 && !S_ISREG(status.st_mode) && !S_ISDIR(status.st_mode));
}

bool can_be_streamed(const std::string &format) { return format == "wav" || format == "raw"; }

void reserve_standard_output() {
  standard_output = fcntl(STDOUT_FILENO, F_DUPFD_CLOEXEC, STDERR_FILENO + 1);
  if (standard_output < 0 || dup2(STDERR_FILENO, STDOUT_FILENO) < 0)
    throw std::system_error(errno, std::generic_category(), "standard output");
}

std::unique_ptr<AudioOutput> open_audio_output(const std::string &name, const std::string &format,
                                               int rate_hz, bool replace) {
  if (is_streamed(name)) return std::make_unique<Streamed>(name, format, rate_hz);
  return std::make_unique<WholeFile>(name, OutputFormat{rate_hz, 1, sndfile_format(format)},
                                     replace);
}

}  // namespace orvalis::cli
