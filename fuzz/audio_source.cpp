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

std::string path_of(int descriptor) { return "/proc/self/fd/" + std::to_string(descriptor); }

/// From a pipe that another thread fills, cut into pieces.
std::size_t read_pipe(std::span<const std::uint8_t> bytes, std::size_t piece,
                      const orvalis::cli::AudioSettings &settings) {
  std::signal(SIGPIPE, SIG_IGN);  // when the reader has had enough
  int ends[2];
  require(pipe(ends) == 0, "a pipe is made");
  std::thread writer([bytes, piece, end = ends[1]]() mutable {
    while (!bytes.empty()) {
      const auto part = bytes.first(std::min(piece, bytes.size()));
      if (write(end, part.data(), part.size()) != static_cast<ssize_t>(part.size())) break;
      bytes = bytes.subspan(part.size());
    }
    close(end);
  });
  const std::size_t heard = read_all(path_of(ends[0]), settings);
  close(ends[0]);
  writer.join();
  return heard;
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t *bytes, std::size_t size) {
  if (size < 2) return 0;
  const auto settings = settings_of(bytes[0]);
  const std::span content(bytes + 2, size - 2);
  const int file = memfd_create("audio", MFD_CLOEXEC);
  require(write(file, content.data(), content.size()) == std::ssize(content), "a file is made");
  read_all(path_of(file), settings);
  close(file);
  // The end is cut off, too, if the second byte says so.
  const auto kept =
      content.first(bytes[1] < 128 ? content.size() : content.size() * (bytes[1] - 127) / 129);
  const std::size_t piece = 1 + bytes[1] % 128;
  require(read_pipe(kept, piece, settings) == read_pipe(kept, kept.size(), settings),
          "pieces do not matter");
  return 0;
}
