// The enhancement stream: any settings, chunk sizes, rooms and audio.
#include "stream/enhancement_stream.h"

#include <algorithm>
#include <cstring>
#include <type_traits>

#include "fuzz/input.h"
#include "jni/orvalis.h"

namespace {

using orvalis::fuzz::Input;
using orvalis::fuzz::require;
using orvalis::fuzz::Samples;

constexpr std::size_t kMaxSamples = 24000;
constexpr std::int16_t kGuard = 12345;

/// A stream and its output. Calls try little room first.
class Enhancer {
public:
  explicit Enhancer(const EnhancementSettings &settings)
      : settings_(settings), stream_(OpenEnhancementStream(&settings)) {}
  ~Enhancer() { CloseEnhancementStream(stream_); }
  Enhancer(const Enhancer &) = delete;
  Enhancer &operator=(const Enhancer &) = delete;

  bool is_open() const { return stream_ != nullptr; }
  const Samples &output() const { return output_; }

  EnhancementCounts counts() const {
    EnhancementCounts counts;
    require(GetEnhancementCounts(stream_, &counts) == 0, "counts are returned");
    return counts;
  }

  void push(const Samples &audio, std::int32_t room) {
    const auto count = static_cast<std::int32_t>(audio.size());
    const auto into = [&](std::int16_t *out, std::int32_t size) {
      return PushEnhancementAudio(stream_, audio.data(), count, out, size);
    };
    if (!gives(room, into))
      require(gives(count / settings_.microphones + 160, into), "a push has the room it needs");
    pushed_ += count;
  }

  void flush(std::int32_t room) {
    const auto into = [&](std::int16_t *out, std::int32_t size) {
      return FlushEnhancementStream(stream_, out, size);
    };
    if (pushed_ % settings_.microphones != 0) {
      require(!gives(ENHANCEMENT_HELD_BACK, into), "half a pair is not flushed");
      push({1}, 0);
    }
    if (!gives(room, into))
      require(gives(ENHANCEMENT_HELD_BACK, into), "a flush has the room it needs");
    require(gives(0, into), "nothing is left after a flush");
    const std::int64_t n = pushed_ / settings_.microphones;
    const std::int64_t front = settings_.aligned == 1 || n == 0 ? 0 : EnhancementDelay(stream_);
    require(std::ssize(output_) == n + front, "the output has the length of the input");
  }

private:
  /// False if the room was refused; nothing may have been written to it then.
  template <class Into>
  bool gives(std::int32_t room, Into into) {
    Samples out(static_cast<std::size_t>(room) + 1, kGuard);
    const std::int32_t ready = into(out.data(), room);
    require(ready >= -1 && ready <= room, "no more comes out than there is room");
    const auto end = out.begin() + std::max(ready, 0);
    require(std::count(end, out.end(), kGuard) == out.end() - end, "nothing is written behind");
    output_.insert(output_.end(), out.begin(), end);
    return ready >= 0;
  }

  EnhancementSettings settings_;
  EnhancementStream *stream_;
  std::int64_t pushed_ = 0;
  Samples output_;
};

/// One byte for all that is valid, and some that is not; 255 for any.
EnhancementSettings read_settings(Input &input) {
  constexpr std::int32_t kSuppressions[] = {0, 13, 18};
  const std::uint8_t choice = input.byte();
  if (choice == 255) return {input.number(), input.number(), input.number(), input.number()};
  return {1 + choice / 2 % 2, kSuppressions[choice / 4 % 3], choice % 2, choice / 12 % 2};
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t *bytes, std::size_t size) {
  SetLogSink(LogNothing, nullptr);
  Input input(bytes, size);
  const EnhancementSettings settings = read_settings(input);
  Enhancer chunked(settings), whole(settings);
  if (!chunked.is_open()) return 0;
  Samples pushed;
  const std::uint8_t room_at_end = input.byte();
  while (!input.is_empty() && pushed.size() < kMaxSamples) {
    const std::uint8_t room = input.byte();
    const Samples audio = input.audio();
    pushed.insert(pushed.end(), audio.begin(), audio.end());
    chunked.push(audio, room);
  }
  chunked.flush(room_at_end);
  whole.push(pushed, 0);
  whole.flush(0);
  require(chunked.output() == whole.output(), "no sample is lost or depends on the chunk size");
  static_assert(std::has_unique_object_representations_v<EnhancementCounts>);
  const EnhancementCounts counts = chunked.counts(), expected = whole.counts();
  require(std::memcmp(&counts, &expected, sizeof counts) == 0, "nor does a count");
  return 0;
}
