// The detector through the flat interface: any mode, content type, chunk size, reset and audio.
#include <algorithm>
#include <cstring>

#include "fuzz/input.h"
#include "jni/orvalis.h"

namespace {

using orvalis::fuzz::Input;
using orvalis::fuzz::require;

constexpr std::size_t kMaxSamples = 24000;  // a longer input teaches nothing new

void check_line(int priority, const char *tag, const char *text, void * /*user*/) {
  require(priority == 3 || priority == 4 || priority == 6, "log lines have a known priority");
  require(std::strcmp(tag, "Orvalis") == 0, "log lines carry the tag");
  require(std::strlen(text) <= 255, "log lines are at most 255 bytes long");
}

std::int32_t read_mode(Input &input) {
  constexpr std::int32_t kModes[] = {0, 1000, 10000, 11000, 20000, 21000, 4};
  const std::uint8_t choice = input.byte();
  return choice < std::size(kModes) ? kModes[choice] : input.number();
}

/// By the rules of the manual, whatever the other fields are.
std::size_t frame_samples(std::int32_t mode) {
  const std::int32_t rate = mode / 1000 % 10;
  return rate > 1 || rate == 0 ? 160 : 80;
}

void process(EpdInstance *epd, std::vector<std::int16_t> audio, std::size_t frame, Input &input) {
  const std::uint8_t how = input.byte();
  if (how & 1) audio.resize(audio.size() / frame * frame);
  const std::vector<std::int16_t> given(audio.begin(), audio.end());  // without spare capacity
  const std::vector<std::int16_t> before = given;
  const auto samples = static_cast<std::int32_t>(given.size());

  std::int32_t result;
  switch (how / 2 % 3) {
    case 0:
      result = ProcessEPDFrame(epd, given.data(), samples);
      break;
    case 1:
      result = ProcessEPDFrameByCnttype(epd, given.data(), samples, input.number());
      break;
    default:
      result = ProcessEPDFrameByMode(epd, given.data(), samples, input.number());
  }
  require(result == 0 || result == 1, "a result is 0 or 1");
  require(result == 0 || given.size() % frame == 0, "a partial frame gives 0");
  require(given == before, "the caller's buffer is not changed");
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t *bytes, std::size_t size) {
  SetLogSink(check_line, nullptr);
  Input input(bytes, size);
  const std::int32_t mode = read_mode(input);
  EpdInstance *epd = InitializeEPD(mode, 0);
  require(epd != nullptr, "a detector is created");

  for (std::size_t pushed = 0; !input.is_empty() && pushed < kMaxSamples;) {
    switch (input.byte() % 8) {
      case 0:
        require(ResetEPDparams(epd) == 0, "a reset succeeds");
        break;
      case 1:
        require(setLogging(epd, input.number()) == 0, "logging is switched");
        break;
      case 2: {
        const std::int32_t samples = input.number();
        require(ProcessEPDFrame(epd, nullptr, samples) == (samples > 0 ? -1 : 0),
                "only no samples may have a null pointer");
        break;
      }
      default: {
        std::vector<std::int16_t> audio = input.audio();
        pushed += audio.size();
        process(epd, std::move(audio), frame_samples(mode), input);
      }
    }
  }
  require(FreeMemoryEPD(epd) == 0, "a detector is released");
  return 0;
}
