#include "cli/level_stage.h"

#include <orvalis.h>

#include <new>

namespace orvalis::cli {

LevelStage::LevelStage(Occurrences &loud_frames)
    : FrameStage(1, 0, true), drc_(InitializeDRC(16000, 0)), loud_frames_(loud_frames) {
  if (drc_ == -1) throw std::bad_alloc();
}

LevelStage::~LevelStage() { FreeMemoryDRC(drc_); }

void LevelStage::work(std::span<const std::int16_t>, OutputFrame output) {
  if (ProcessDRC(drc_, output.data(), kFrameSamples) == 1) loud_frames_.note(position_);
  position_ += kFrameSamples;
}

}  // namespace orvalis::cli
