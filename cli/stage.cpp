#include "cli/stage.h"

namespace orvalis::cli {

void Chain::push(std::span<const std::int16_t> input, std::vector<std::int16_t> &output) {
  in_.assign(input.begin(), input.end());
  for (const auto &stage : stages_) {
    out_.clear();
    stage->push(in_, out_);
    in_.swap(out_);
  }
  output.insert(output.end(), in_.begin(), in_.end());
}

void Chain::flush(std::vector<std::int16_t> &output) {
  in_.clear();
  for (const auto &stage : stages_) {
    out_.clear();
    stage->push(in_, out_);  // what the stages before have just let go
    stage->flush(out_);
    in_.swap(out_);
  }
  output.insert(output.end(), in_.begin(), in_.end());
}

}  // namespace orvalis::cli
