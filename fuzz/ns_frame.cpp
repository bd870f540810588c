// Noise suppression and dynamics control through the flat interface: any mode, any number of
// microphones, any chunk size and audio.
#include <algorithm>

#include "fuzz/input.h"
#include "jni/orvalis.h"

namespace {

using orvalis::fuzz::Input;
using orvalis::fuzz::require;
using orvalis::fuzz::Samples;

constexpr std::size_t kMaxSamples = 48000;  // a longer input teaches nothing new
// A last frame that is processed whole, and the 160 samples that the suppressor takes of it, stay
// within.
constexpr std::size_t kTail = 320;
constexpr std::int16_t kGuard = 12345;

bool is_guard(const Samples &audio, std::int32_t from) {
  return std::count(audio.begin() + from, audio.end(), kGuard) ==
         audio.end() - audio.begin() - from;
}

struct Suppressor {
  std::int32_t mics, frame;  ///< the frame is 0 if every call is refused
  NsInstance *ns;
  std::int64_t processed = 0;

  void suppress(Samples audio, std::int32_t count) {
    Samples output = audio;
    require(ProcessDoNSFrame(ns, audio.data(), count, output.data(), count + 1) == -1,
            "counts that differ are refused");
    const Samples before = audio;
    const std::int32_t result = ProcessDoNSFrame(ns, audio.data(), count, output.data(), count);
    if (frame == 0) {
      require(result == -1 && audio == before && output == before, "narrow band is refused");
      return;
    }
    const std::int32_t frames = (count + frame - 1) / frame;
    processed += frames * frame;
    require(result == processed, "the samples of whole frames are counted");
    require(mics == 1 || audio == before, "only one microphone overwrites the input");
    require(mics == 1 || mics == 2 || output == before, "nothing else suppresses");
    // The last frame begins within the audio; one microphone takes 160 samples from there.
    const std::int32_t reach = frames == 0 ? 0 : (frames - 1) * frame + std::max(frame, 160);
    require(is_guard(output, reach), "nothing is written behind the last frame");
  }
};

void level(std::int64_t drc, std::int32_t rate, Samples audio, std::int32_t count) {
  const Samples before = audio;
  const std::int32_t result = ProcessDRC(drc, audio.data(), count);
  require(result == 0 || (result == 1 && rate == 16000), "loud audio is reported at 16 kHz only");
  require(rate == 16000 || audio == before, "other rates are left alone");
  require(is_guard(audio, (count + 159) / 160 * 160), "nothing is written behind the last frame");
}

Suppressor read_suppressor(Input &input) {
  constexpr std::int32_t kModes[] = {0, 2, 1000, 2000, 2002, 3000, -1000, 12};
  const std::uint8_t choice = input.byte();
  const std::int32_t mode = choice < std::size(kModes) ? kModes[choice] : input.number();
  std::int32_t mics = 1 + input.byte() % 2;
  if (choice == 200) mics = input.number();
  const std::int32_t rate = mode / 1000 % 10;
  const std::int32_t frame = mics == 2 || rate == 2 ? 320 : rate == 0 ? 160 : rate == 1 ? 0 : 80;
  return {mics, frame, InitializeDoNS(mode, mics, input.byte())};
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t *bytes, std::size_t size) {
  SetLogSink(LogNothing, nullptr);
  Input input(bytes, size);
  Suppressor suppressor = read_suppressor(input);
  const auto &[mics, frame, ns, processed] = suppressor;
  const std::int32_t rate = input.byte() % 8 == 0 ? input.number() : 16000;
  const std::int64_t drc = InitializeDRC(rate, 0);
  for (std::size_t pushed = 0; !input.is_empty() && pushed < kMaxSamples;) {
    const std::uint8_t what = input.byte();
    if (what % 16 == 0) {
      const std::int32_t count = input.number();
      const bool is_refused = ProcessDoNSFrame(ns, nullptr, count, nullptr, count) == -1;
      require(is_refused == (count > 0 || frame == 0), "only no samples may have a null pointer");
      require(ProcessDRC(drc, nullptr, count) == (count > 0 ? -1 : 0), "nor here");
      continue;
    }
    Samples audio = input.audio();
    pushed += audio.size();
    auto count = static_cast<std::int32_t>(audio.size());
    if (what % 2 == 0 && frame != 0) count = count / frame * frame;
    audio.resize(static_cast<std::size_t>(count));
    audio.resize(audio.size() + kTail, kGuard);
    level(drc, rate, audio, count);
    suppressor.suppress(std::move(audio), count);
  }
  require(FreeMemoryNS(ns) == 0 && FreeMemoryDRC(drc) == 0, "both are released");
  return 0;
}
