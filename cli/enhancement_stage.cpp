#include "cli/enhancement_stage.h"

#include <new>
#include <utility>

namespace orvalis::cli {
namespace {

/// Appends what `give` writes, given where and how much room there is. Returns how much that was.
template <class Give>
std::size_t append(std::vector<std::int16_t> &output, std::size_t room, Give give) {
  const std::size_t before = output.size();
  output.resize(before + room);
  const std::int32_t ready = give(output.data() + before, static_cast<std::int32_t>(room));
  output.resize(before + static_cast<std::size_t>(ready));
  return static_cast<std::size_t>(ready);
}

}  // namespace

EnhancementStage::EnhancementStage(const EnhancementSettings &settings)
    : channels_(static_cast<std::size_t>(settings.microphones)),
      stream_(OpenEnhancementStream(&settings)) {
  if (!stream_) throw std::bad_alloc();
}

void EnhancementStage::push(std::span<const std::int16_t> input,
                            std::vector<std::int16_t> &output) {
  held_back_ += input.size() / channels_;
  const std::size_t room = input.size() / channels_ + ENHANCEMENT_HELD_BACK;
  held_back_ -= append(output, room, [&](std::int16_t *out, std::int32_t size) {
    return PushEnhancementAudio(stream_.get(), input.data(),
                                static_cast<std::int32_t>(input.size()), out, size);
  });
}

void EnhancementStage::flush(std::vector<std::int16_t> &output) {
  const std::size_t ready =
      append(output, ENHANCEMENT_HELD_BACK, [&](std::int16_t *out, std::int32_t size) {
        return FlushEnhancementStream(stream_.get(), out, size);
      });
  output.resize(output.size() - (ready - std::exchange(held_back_, 0)));
}

EnhancementCounts EnhancementStage::counts() const {
  EnhancementCounts counts;
  GetEnhancementCounts(stream_.get(), &counts);
  return counts;
}

}  // namespace orvalis::cli
