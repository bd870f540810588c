// The detector through the flat interface: any mode, content type, chunk size, reset and audio.
#include <algorithm>
#include <cstring>

#include "fuzz/input.h"
#include "jni/orvalis.h"

namespace {

using orvalis::fuzz::Input;
using orvalis::fuzz::require;
using orvalis::fuzz::Samples;

constexpr std::size_t kMaxSamples = 24000;  // a longer input teaches nothing new

void check_line(int priority, const char *tag, const char *text, void * /*user*/) {
  require(priority == 3 || priority == 4 || priority == 6, "log lines have a known priority");
  require(std::strcmp(tag, "Orvalis") == 0, "log lines carry the tag");
  require(std::strlen(text) <= 255, "log lines are at most 255 bytes long");
}

void process(EpdInstance *epd, Samples audio, std::size_t frame, Input &input) {
  const std::uint8_t how = input.byte();
  if (how & 1) audio.resize(audio.size() / frame * frame);
  const Samples given(audio.begin(), audio.end());  // without spare capacity
  const auto count = static_cast<std::int32_t>(given.size());
  const std::int32_t result =
      how / 2 % 3 == 0   ? ProcessEPDFrame(epd, given.data(), count)
      : how / 2 % 3 == 1 ? ProcessEPDFrameByCnttype(epd, given.data(), count, input.number())
                         : ProcessEPDFrameByMode(epd, given.data(), count, input.number());
  require(result == 0 || result == 1, "a result is 0 or 1");
  require(result == 0 || given.size() % frame == 0, "a partial frame gives 0");
  require(std::equal(given.begin(), given.end(), audio.begin()), "the caller's buffer is kept");
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t *bytes, std::size_t size) {
  SetLogSink(check_line, nullptr);
  Input input(bytes, size);
  constexpr std::int32_t kModes[] = {0, 1000, 10000, 11000, 20000, 21000, 4};
  const std::uint8_t choice = input.byte();
  const std::int32_t mode = choice < std::size(kModes) ? kModes[choice] : input.number();
  const std::int32_t rate = mode / 1000 % 10;  // by the manual, whatever the other fields are
  const std::size_t frame = rate > 1 || rate == 0 ? 160 : 80;
  EpdInstance *epd = InitializeEPD(mode, 0);
  require(epd != nullptr, "a detector is created");
  for (std::size_t pushed = 0; !input.is_empty() && pushed < kMaxSamples;) {
    const std::uint8_t call = input.byte() % 8;
    if (call == 0) {
      require(ResetEPDparams(epd) == 0, "a reset succeeds");
    } else if (call == 1) {
      require(setLogging(epd, input.number()) == 0, "logging is switched");
    } else if (call == 2) {
      const std::int32_t count = input.number();
      require(ProcessEPDFrame(epd, nullptr, count) == (count > 0 ? -1 : 0),
              "only no samples may have a null pointer");
    } else {
      Samples audio = input.audio();
      pushed += audio.size();
      process(epd, std::move(audio), frame, input);
    }
  }
  require(FreeMemoryEPD(epd) == 0, "a detector is released");
  return 0;
}
