// The tool's reading of audio: any bytes as a file, whatever they claim to be.
#include "cli/audio_source.h"

#include <sys/mman.h>
#include <unistd.h>

#include <string>

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

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t *bytes, std::size_t size) {
  if (size == 0) return 0;
  const MemoryFile file(bytes + 1, size - 1);
  try {
    const auto settings = settings_of(bytes[0]);
    orvalis::cli::AudioSource source(file.path(), settings);
    require(source.rate_hz() == 8000 || source.rate_hz() == 16000, "audio comes at 8 or 16 kHz");
    std::size_t read = 0;
    while (read < kMaxSamples) {
      const auto samples = source.read();
      if (samples.empty()) break;
      require(settings.channels != orvalis::cli::Channels::kPair || samples.size() % 2 == 0,
              "pairs come whole");
      read += samples.size();
    }
    if (read < kMaxSamples) source.check_complete();
  } catch (const orvalis::cli::AudioError &) {
    // The tool tells the user and goes on with the next file; anything else would end it.
  }
  return 0;
}
