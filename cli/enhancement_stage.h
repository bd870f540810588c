// The enhancement stream as a stage.
#pragma once

#include <enhancement_stream.h>

#include <memory>

#include "cli/stage.h"

namespace orvalis::cli {

/// Takes one channel or interleaved pairs, and gives one channel that is as long: of a stream that
/// is not aligned the end is left out.
class EnhancementStage : public Stage {
public:
  explicit EnhancementStage(const EnhancementSettings &settings);

  void push(std::span<const std::int16_t> input, std::vector<std::int16_t> &output) override;
  void flush(std::vector<std::int16_t> &output) override;

  EnhancementCounts counts() const;

private:
  struct Close {
    void operator()(EnhancementStream *stream) const { CloseEnhancementStream(stream); }
  };

  std::size_t channels_;
  std::size_t held_back_ = 0;  // samples of the input that have not come out yet
  std::unique_ptr<EnhancementStream, Close> stream_;
};

}  // namespace orvalis::cli
