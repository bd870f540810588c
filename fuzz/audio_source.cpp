// The tool's reading of audio: any bytes as a file or through a pipe, whatever they claim to be.
#include "cli/audio_source.h"

#include <sys/mman.h>
#include <unistd.h>

#include <algorithm>
#include <csignal>
#include <span>
#include <string>
#include <thread>

#include "fuzz/input.h"

namespace {

using orvalis::fuzz::require;

constexpr std::size_t kMaxSamples = 200000;  // silence packs well; there is no end to wait for

/// A file in memory with a name that it can be opened by.
class MemoryFile {
public:
  MemoryFile(const std::uint8_t *bytes, std::size_t size)
      : descriptor_(memfd_create("audio", MFD_CLOEXEC)) {
    require(descriptor_ >= 0 && write(descriptor_, bytes, size) == static_cast<ssize_t>(size),
            "a file is made");
  }
  ~MemoryFile() { close(descriptor_); }
  MemoryFile(const MemoryFile &) = delete;
  MemoryFile &operator=(const MemoryFile &) = delete;

  std::string path() const { return "/proc/self/fd/" + std::to_string(descriptor_); }

private:
  int descriptor_;
};

/// A pipe that another thread fills, cut into pieces.
class CutPipe {
public:
  CutPipe(std::span<const std::uint8_t> bytes, std::size_t piece) {
    std::signal(SIGPIPE, SIG_IGN);  // when the reader has had enough
    require(pipe(ends_) == 0, "a pipe is made");
    writer_ = std::thread([bytes, piece, end = ends_[1]]() mutable {
      while (!bytes.empty()) {
        const auto part = bytes.first(std::min(piece, bytes.size()));
        if (write(end, part.data(), part.size()) != static_cast<ssize_t>(part.size())) break;
        bytes = bytes.subspan(part.size());
      }
      close(end);
    });
  }
  ~CutPipe() {
    close(ends_[0]);
    writer_.join();
  }
  CutPipe(const CutPipe &) = delete;
  CutPipe &operator=(const CutPipe &) = delete;

  std::string path() const { return "/proc/self/fd/" + std::to_string(ends_[0]); }

private:
  int ends_[2];
  std::thread writer_;
};

orvalis::cli::AudioSettings settings_of(std::uint8_t byte) {
  using orvalis::cli::Channels;
  constexpr int kRates[] = {16000, 8000, 44100, 11025};
  return {.raw = byte % 4 == 3,
          .raw_rate_hz = kRates[byte / 4 % 4],
          .raw_channels = 1 + byte / 16 % 4,
          .channel = byte / 64,
          .channels = byte % 8 == 6 ? Channels::kPair : Channels::kMean,
          .wide_only = byte % 8 >= 6};
}

/// Returns the number of samples; 0, too, for what is refused.
std::size_t read_all(const std::string &path, const orvalis::cli::AudioSettings &settings) {
  std::size_t heard = 0;
  try {
    orvalis::cli::AudioSource source(path, settings);
    require(source.rate_hz() == 8000 || source.rate_hz() == 16000, "audio comes at 8 or 16 kHz");
    while (heard < kMaxSamples) {
      const auto samples = source.read();
      if (samples.empty()) break;
      require(settings.channels != orvalis::cli::Channels::kPair || samples.size() % 2 == 0,
              "pairs come whole");
      heard += samples.size();
    }
    if (heard < kMaxSamples) source.check_complete();
  } catch (const orvalis::cli::AudioError &) {
    // The tool tells the user and goes on with the next file; anything else would end it.
  }
  return heard;
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t *bytes, std::size_t size) {
  if (size < 2) return 0;
  const auto settings = settings_of(bytes[0]);
  const std::span content(bytes + 2, size - 2);
  read_all(MemoryFile(content.data(), content.size()).path(), settings);
  // The end is cut off, too, if the second byte says so.
  const std::size_t kept =
      bytes[1] < 128 ? content.size() : content.size() * (bytes[1] - 127) / 129;
  const std::size_t piece = 1 + bytes[1] % 128;
  const std::size_t heard = read_all(CutPipe(content.first(kept), piece).path(), settings);
  require(heard == read_all(CutPipe(content.first(kept), kept).path(), settings),
          "pieces do not matter");
  return 0;
}
