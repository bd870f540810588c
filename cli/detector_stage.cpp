#include "cli/detector_stage.h"

#include <new>
#include <utility>

#include "cli/split_names.h"

namespace orvalis::cli {

DetectorStage::DetectorStage(std::string name, const UtteranceSettings &detector,
                             SplitSettings split, std::unique_ptr<Excerpts> excerpts,
                             Report &report)
    : name_(std::move(name)),
      split_(std::move(split)),
      excerpts_(std::move(excerpts)),
      report_(report),
      stream_(OpenUtteranceStream(&detector)) {
  if (!stream_) throw std::bad_alloc();
}

void DetectorStage::push(std::span<const std::int16_t> input, std::vector<std::int16_t> &output) {
  output.insert(output.end(), input.begin(), input.end());
  if (excerpts_) excerpts_->hear(input);
  while (!input.empty()) {
    const auto taken =
        PushUtteranceAudio(stream_.get(), input.data(), static_cast<std::int32_t>(input.size()));
    input = input.subspan(static_cast<std::size_t>(taken));
    take_decided();
  }
}

void DetectorStage::flush(std::vector<std::int16_t> &) {
  FlushUtteranceStream(stream_.get());
  take_decided();
}

void DetectorStage::take_decided() {
  for (Utterance found; NextUtterance(stream_.get(), &found) == 1;) {
    // First, so that what is reported is there.
    if (excerpts_)
      excerpts_->write(found.start, found.end, part_name(split_.folder, name_, found.number),
                       split_.replace);
    report_.utterance(found);
  }
  if (excerpts_) excerpts_->forget_before(EarliestUtteranceStart(stream_.get()));
}

}  // namespace orvalis::cli
