#include "Voice_Engine/epd/kepd.h"

#include <algorithm>

#include "Voice_Engine/epd/epd_instance.h"
#include "Voice_Engine/platform/log.h"

namespace orvalis {
namespace {

constexpr Word32 kInitialNoiseFrames = 39;  // which never count as voice
constexpr Word32 kVoicedToClearPause = 4;
constexpr Word32 kTrackedFrames = 45;  // frames of the noise history and of the speech mean
constexpr float kGateScore = 0.84F;

void close_utterance(KepdState &kepd) {
  kepd.onset_cnt = 0;
  kepd.pause_cnt = 0;
  kepd.in_speech = 0;
  kepd.long_speech = 0;
  kepd.end_cnt = 0;
  kepd.speech_frames = 0;
}

/// Updates onset, voiced run and pause.
void count_frame(KepdState &kepd, bool voiced, Word32 onset) {
  if (voiced) {
    count_up(kepd.onset_cnt);
    if (kepd.onset_cnt >= onset) kepd.in_speech = 1;
    if (kepd.onset_cnt == onset) {
      log_line(kLogInfo, kLogTag, "TQE: Onset of voice ... VAD_communication_flag ");
    }
  } else {
    kepd.onset_cnt = 0;
  }

  if (kepd.in_speech != 1 || !voiced) {
    kepd.voiced_run = 0;
    if (kepd.in_speech == 1) count_up(kepd.pause_cnt);
  } else if (++kepd.voiced_run == kVoicedToClearPause) {
    kepd.voiced_run = 0;
    kepd.pause_cnt = 0;
  }
}

/// The decision on a frame that has been counted.
Word32 conclude(KepdState &kepd, const KepdTiming &timing) {
  if (kepd.pause_cnt >= timing.pause_limit) {
    if (kepd.speech_frames <= kShortUtterance) {
      close_utterance(kepd);
      return kNoSpeech;
    }
    kepd.long_speech = 1;
  }
  if (kepd.in_speech != 1) return kNoSpeech;
  count_up(kepd.speech_frames);
  if (kepd.long_speech == 1) kepd.end_cnt += 1;
  if (kepd.end_cnt < timing.end_delay) return kSpeech;
  close_utterance(kepd);
  return kEndOfSpeech;
}

/// Appends a frame's energy to the history and updates the noise floor, whose previous value is
/// part of the new mean.
void track_noise_floor(NoiseFloorState &floor, float energy) {
  count_up(floor.noise_frames);
  float *const end = floor.energy_hist + kTrackedFrames;
  if (floor.noise_frames <= kTrackedFrames) {
    floor.energy_hist[floor.noise_frames - 1] = energy;
  } else {
    std::copy(floor.energy_hist + 1, end, floor.energy_hist);
    end[-1] = energy;
  }
  float sum = floor.noise_energy;
  for (const float past : floor.energy_hist) sum += past;
  floor.noise_energy = sum / static_cast<float>(std::min(floor.noise_frames, kTrackedFrames));
}

/// Adds a frame's energy to the speech mean; the 45th frame completes it.
void track_speech(NoiseFloorState &floor, float energy) {
  floor.speech_frames_ne += 1;
  floor.speech_energy += energy;
  if (floor.speech_frames_ne != kTrackedFrames) return;
  floor.speech_energy /= static_cast<float>(kTrackedFrames);
  // Infinite or not a number over digital silence. Only readers of the record use it.
  floor.speech_noise_ratio = floor.speech_energy / floor.noise_energy;
}

}  // namespace

Word32 InitKEPD(EpdInstance **handle) {
  if (*handle == nullptr) return -1;
  EpdInstance &epd = **handle;
  epd.kepd = {};
  if (static_cast<std::uint32_t>(epd.epdMode) > 3) epd.epdMode = 0;
  VelmoraVadState *vad = &epd.vad;
  VelmoraVADInit(&vad, epd.rateMode);
  vad->blk_frames = 0;
  vad->blk_count = 0;
  vad->energy_th = 0;
  vad->blk_acc = 0;
  vad->blk_mean = 0;
  vad->speech_level = 0;
  vad->vad_flag = 0;
  return 0;
}

Word32 InitNoiseEstimation(EpdInstance **handle) {
  (*handle)->noise_floor = {};
  return 0;
}

Word32 decide(KepdState &kepd, bool voiced, std::uint32_t content_type, bool narrow_band,
              EpdReasons &reasons) {
  const KepdTiming timing = timing_of(content_type, narrow_band);
  count_up(kepd.frame_cnt);
  reasons.voice = voiced && kepd.frame_cnt > kInitialNoiseFrames;
  count_frame(kepd, reasons.voice != 0, timing.onset);
  reasons.onset = kepd.onset_cnt;
  reasons.onsetFrames = timing.onset;
  reasons.pause = kepd.pause_cnt;
  reasons.pauseFrames = timing.pause_limit;
  reasons.answer = conclude(kepd, timing);
  return reasons.answer;
}

Word32 KEPDfunc(Flags &flags, EpdInstance **handle, const Word16 *frame, std::uint32_t type,
                EpdReasons &reasons) {
  if (*handle == nullptr) return -1;
  EpdInstance &epd = **handle;
  VelmoraVadState *vad = &epd.vad;
  const Word32 voice =
      processVelmoraVAD(flags, &vad, frame, &epd.kepd.EnergyTHscore, epd.rateMode, reasons);
  if (epd.noise_floor.speech_frames_ne == kTrackedFrames) {
    epd.noise_floor.speech_frames_ne += 1;
    epd.kepd.EnergyTHscore = kGateScore;
    log_line(kLogInfo, kLogTag, "TQE: EnergyTHscore: %f", double{kGateScore});
  }
  return decide(epd.kepd, voice == 1, type, epd.rateMode != 0, reasons);
}

Word32 KEPDfunc_NoiseEstimation(EpdInstance **handle, const Word16 *frame, Word32 /*decision*/) {
  EpdInstance &epd = **handle;
  NoiseFloorState &floor = epd.noise_floor;
  if (floor.speech_frames_ne >= kTrackedFrames) return 0;
  const float energy = getAbsoluteEnergy(frame, epd.rateMode);
  if (epd.vad.vad_flag == 0) {
    track_noise_floor(floor, energy);
  } else {
    track_speech(floor, energy);
  }
  return 0;
}

Word32 KEPDfunc_Reset(EpdInstance **handle) {
  log_line(kLogInfo, kLogTag, "TQE: reset KEPDfunc params");
  KepdState &kepd = (*handle)->kepd;
  close_utterance(kepd);
  kepd.voiced_run = 0;
  return 0;
}

Word32 CloseKEPD(EpdInstance **) { return 0; }

float getAbsoluteEnergy(const Word16 *x, Word32 rateMode) {
  const int samples = rateMode == 2 ? 320 : rateMode == 0 ? 160 : 80;
  Word64 sum = 0;
  for (int i = 0; i < samples; ++i) sum += static_cast<Word64>(x[i]) * x[i];
  return static_cast<float>(sum / (samples * 100));
}

}  // namespace orvalis
