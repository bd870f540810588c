// Noise suppression and dynamics control through the flat interface: any mode, any number of
// microphones, any chunk size and audio.
#include <algorithm>

#include "fuzz/input.h"
#include "jni/orvalis.h"

namespace {

using orvalis::fuzz::Input;
using orvalis::fuzz::require;
using Audio = orvalis::fuzz::Samples;

constexpr std::size_t kMaxSamples = 48000;  // a longer input teaches nothing new
// A last frame that is processed whole, and the 160 samples that the suppressor takes of it, stay
// within.
constexpr std::size_t kTail = 320;
constexpr std::int16_t kGuard = 12345;

struct Suppressor {
  std::int32_t mics;
  std::int32_t frame;  ///< 0 if it refuses every call
  NsInstance *ns;
  std::int64_t processed = 0;

  explicit Suppressor(Input &input) {
    constexpr std::int32_t kModes[] = {0, 2, 1000, 2000, 2002, 3000, -1000, 12};
    const std::uint8_t choice = input.byte();
    const std::int32_t mode = choice < std::size(kModes) ? kModes[choice] : input.number();
    mics = 1 + input.byte() % 2;
    if (choice == 200) mics = input.number();
    const std::int32_t rate = mode / 1000 % 10;
    frame = mics == 2 || rate == 2 ? 320 : rate == 0 ? 160 : rate == 1 ? 0 : 80;
    ns = InitializeDoNS(mode, mics, input.byte());
    require(ns != nullptr, "a suppressor is created");
  }

  void suppress(Audio audio) {
    const auto count = static_cast<std::int32_t>(audio.size());
    audio.resize(audio.size() + kTail, kGuard);
    Audio output = audio;
    require(ProcessDoNSFrame(ns, audio.data(), count, output.data(), count + 1) == -1,
            "counts that differ are refused");
    const Audio before = audio;
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
    require(std::all_of(output.begin() + reach, output.end(), [](int x) { return x == kGuard; }),
            "nothing is written behind the last frame");
  }
};

void level(std::int64_t drc, std::int32_t rate, Audio audio) {
  const auto count = static_cast<std::int32_t>(audio.size());
  audio.resize(audio.size() + kTail, kGuard);
  const Audio before = audio;
  const std::int32_t result = ProcessDRC(drc, audio.data(), count);
  require(result == 0 || (result == 1 && rate == 16000), "loud audio is reported at 16 kHz only");
  require(rate == 16000 || audio == before, "other rates are left alone");
  const auto whole = (count + 159) / 160 * 160;
  require(std::equal(audio.begin() + whole, audio.end(), before.begin() + whole),
          "nothing is written behind the last frame");
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t *bytes, std::size_t size) {
  SetLogSink(LogNothing, nullptr);
  Input input(bytes, size);
  Suppressor suppressor(input);
  const std::int32_t rate = input.byte() % 8 == 0 ? input.number() : 16000;
  const std::int64_t drc = InitializeDRC(rate, 0);
  require(drc != -1, "a dynamics control is created");

  for (std::size_t pushed = 0; !input.is_empty() && pushed < kMaxSamples;) {
    const std::uint8_t what = input.byte();
    if (what % 16 == 0) {
      const std::int32_t count = input.number();
      const std::int32_t refused = count > 0 || suppressor.frame == 0 ? -1 : 0;
      require((ProcessDoNSFrame(suppressor.ns, nullptr, count, nullptr, count) == -1) ==
                  (refused == -1),
              "only no samples may have a null pointer");
      require(ProcessDRC(drc, nullptr, count) == (count > 0 ? -1 : 0),
              "only no samples may have a null pointer");
      continue;
    }
    Audio audio = input.audio();
    pushed += audio.size();
    if (what % 2 == 0 && suppressor.frame != 0)
      audio.resize(audio.size() / static_cast<std::size_t>(suppressor.frame) *
                   static_cast<std::size_t>(suppressor.frame));
    level(drc, rate, audio);
    suppressor.suppress(std::move(audio));
  }
  require(FreeMemoryNS(suppressor.ns) == 0, "a suppressor is released");
  require(FreeMemoryDRC(drc) == 0, "a dynamics control is released");
  return 0;
}
