#include "cli/audio_output.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cctype>
#include <cerrno>
#include <filesystem>
#include <string_view>
#include <system_error>

namespace orvalis::cli {
namespace {

struct Format {
  std::string name;
  int sndfile_format;
  std::string other_ending;
};

/// Raw samples are little-endian, as they are read.
const std::vector<Format> &formats() {
  static const std::vector<Format> kFormats = {
      {"wav", SF_FORMAT_WAV | SF_FORMAT_PCM_16, "wave"},
      {"flac", SF_FORMAT_FLAC | SF_FORMAT_PCM_16, "fla"},
      {"ogg", SF_FORMAT_OGG | SF_FORMAT_VORBIS, "oga"},
      {"opus", SF_FORMAT_OGG | SF_FORMAT_OPUS, "opus"},
      {"aiff", SF_FORMAT_AIFF | SF_FORMAT_PCM_16, "aif"},
      {"au", SF_FORMAT_AU | SF_FORMAT_PCM_16, "snd"},
      {"caf", SF_FORMAT_CAF | SF_FORMAT_PCM_16, "caf"},
      {"raw", SF_FORMAT_RAW | SF_FORMAT_PCM_16 | SF_ENDIAN_LITTLE, "pcm"},
  };
  return kFormats;
}

class WholeFile : public AudioOutput {
public:
  WholeFile(const OutputTarget &target, int rate_hz, const OutputRules &rules)
      : file_(target.name,
              {rate_hz, 1,
               std::ranges::find(formats(), target.format, &Format::name)->sndfile_format},
              rules) {}

  void write(std::span<const std::int16_t> samples) override { file_.write(samples); }
  void commit() override { file_.commit(); }

private:
  OutputFile file_;
};

/// A WAV header without a length, which libsndfile cannot write. As in other tools that stream, the
/// largest possible length stands for it.
std::array<char, 44> wav_header(int rate_hz) {
  std::array<char, 44> header{};
  std::size_t at = 0;
  const auto put = [&](std::uint32_t value, int bytes) {
    for (int i = 0; i < bytes; ++i) header[at++] = static_cast<char>(value >> (8 * i));
  };
  const auto put_name = [&](std::string_view name) {
    for (const char c : name) header[at++] = c;
  };
  constexpr std::uint32_t kOpenLength = 0xffffffff, kPcm = 1, kChannels = 1, kBytes = 2;
  const auto rate = static_cast<std::uint32_t>(rate_hz);
  put_name("RIFF");
  put(kOpenLength, 4);
  put_name("WAVEfmt ");
  put(16, 4);
  put(kPcm, 2);
  put(kChannels, 2);
  put(rate, 4);
  put(rate * kBytes, 4);
  put(kBytes, 2);
  put(8 * kBytes, 2);
  put_name("data");
  put(kOpenLength, 4);
  return header;
}

class Streamed : public AudioOutput {
public:
  Streamed(const OutputTarget &target, int rate_hz)
      : name_(target.name),
        descriptor_(name_ == "-" ? target.standard_output
                                 : open(name_.c_str(), O_WRONLY | O_CLOEXEC)) {
    if (descriptor_ < 0) fail();
    if (target.format == "wav") {
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
    // Some devices report a failure only now.
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
    throw AudioError(name_ + ": " + error.message());
  }

  std::string name_;
  int descriptor_;
  std::vector<char> bytes_;
};

}  // namespace

std::vector<std::string> output_format_names() {
  std::vector<std::string> names;
  for (const Format &format : formats()) names.push_back(format.name);
  return names;
}

std::string format_of_name(const std::string &file) {
  std::string ending = std::filesystem::path(file).extension().string();
  if (ending.empty()) return "";
  ending.erase(0, 1);
  std::ranges::transform(ending, ending.begin(),
                         [](unsigned char c) { return static_cast<char>(std::tolower(c)); });
  for (const Format &format : formats())
    if (ending == format.name || ending == format.other_ending) return format.name;
  return "";
}

bool is_streamed(const std::string &name) {
  struct stat status;
  return name == "-" ||
         (stat(name.c_str(), &status) == 0 && !S_ISREG(status.st_mode) && !S_ISDIR(status.st_mode));
}

bool can_be_streamed(const std::string &format) { return format == "wav" || format == "raw"; }

std::unique_ptr<AudioOutput> open_audio_output(const OutputTarget &target, int rate_hz,
                                               const OutputRules &rules) {
  if (target.name != "-") check_role(rules.protected_files, target.name);
  struct stat status;
  if (!rules.may_replace && stat(target.name.c_str(), &status) == 0 && S_ISBLK(status.st_mode))
    throw AudioError(target.name + ": the file is a disk; --force writes to it");
  if (is_streamed(target.name)) return std::make_unique<Streamed>(target, rate_hz);
  return std::make_unique<WholeFile>(target, rate_hz, rules);
}

}  // namespace orvalis::cli
