#include "Voice_Engine/epd/epd_instance.h"

#include <algorithm>
#include <cstdint>
#include <cstdlib>

#include "Voice_Engine/channel/frame_screening.h"
#include "Voice_Engine/platform/dump_file.h"
#include "Voice_Engine/platform/log.h"
#include "Voice_Engine/platform/version.h"

namespace orvalis {
namespace {

constexpr char kInputSuffix[] = "_inputEPD.pcm";
constexpr char kResultSuffix[] = "_resultEPD.pcm";
constexpr Word32 kAbnormalSmallSamples = 120;  // from here audio counts as abnormal, at either rate
constexpr SettlingTexts kSettlingTexts = {
    .abnormal = "TQE: Check Abnormal Audio ... dont do NS ... in EPD_Proc_Frame",
    .waiting =
        "TQE: Check Abnormal Audio ... wait few more frame ... dont do NS ... in EPD_Proc_Frame",
};

bool dumps(const EpdInstance &epd) { return epd.pcmDumpEnabled == 1; }

Word32 frame_length(const EpdInstance &epd) { return epd.rateMode == 0 ? 160 : 80; }

/// Logs a buffer that does not hold whole frames, and the settings while nothing is processed yet.
void log_format(const EpdInstance &epd, Word32 numSample) {
  const Word32 length = frame_length(epd);
  if (numSample % length != 0) {
    log_line(kLogDebug, kLogTag,
             "VoiceEngine_JNI, Check pcm buffer size : numSample = %d, PCM_LEN = %d", numSample,
             length);
  }
  if (epd.processedSamples == 0) {
    log_line(kLogDebug, kLogTag,
             "TQE: Velmora EPD ... numSample = %d ... epdMode = %d ... RATE : %d", numSample,
             epd.epdMode, epd.rateMode == 0 ? 16000 : 8000);
  }
}

void apply_input_gain(Word32 gain_mode, Word16 *frame, Word32 length) {
  if (gain_mode == 1) {
    for (Word32 i = 0; i < length; ++i) frame[i] = static_cast<Word16>(frame[i] >> 2);
  } else if (gain_mode == 2) {
    for (Word32 i = 0; i < length; ++i) frame[i] = static_cast<Word16>(frame[i] * 4);  // wraps
  }
}

/// Counts the frames since the last speech and logs the hangover, which is up to the caller.
void note_hangover(EpdInstance &epd, Word32 decision) {
  if (decision == kSpeech) {
    epd.HANGframe = -1;
    return;
  }
  const bool logs = epd.hangLogEnabled == 1;
  if (epd.HANGframe < 1) {
    epd.HANGframe = 0;
    if (logs) {
      log_line(kLogDebug, kLogTag, "%li:TQE: vm_sum ... JAVA HANGOVER started!",
               handle_number(&epd));
    }
  }
  count_up(epd.HANGframe);
  if (epd.HANGframe % 10 == 0 && logs) {
    log_line(kLogDebug, kLogTag, "%li:TQE: _vm_sum ... HANGframe = %d", handle_number(&epd),
             epd.HANGframe);
  }
}

/// What follows from the decision on a frame. Noise floor and dump take the frame as it was before
/// suppression.
void follow_decision(EpdInstance *epd, const Word16 *unsuppressed, Word32 decision,
                     EpdReasons &reasons) {
  KEPDfunc_NoiseEstimation(&epd, unsuppressed, decision);
  reasons.judged += 1;
  reasons.noiseFloor = epd->noise_floor.noise_energy;
  note_hangover(*epd, decision);
  if (!dumps(*epd)) return;
  const Word32 length = frame_length(*epd);
  Word16 result[kMaxFrameSamples];
  std::fill_n(result, length, static_cast<Word16>(1000 * decision));
  write_dump(epd->inputDumpFile, unsuppressed, length);
  write_dump(epd->resultDumpFile, result, length);
}

}  // namespace

EpdInstance *EPD_Create(Word32 mode, Word32 pcmDumpEnabled) {
  auto *epd = static_cast<EpdInstance *>(std::calloc(1, sizeof(EpdInstance)));
  if (epd != nullptr) {
    if (mode == 4) S1CHNSInit(&epd->secondary_suppressor, 0);
    S1CHNSInit(&epd->suppressor, 2);
    const Word32 rate_digit = (mode / 1000) % 10;
    epd->rateMode = rate_digit > 1 ? 0 : rate_digit;
    epd->epdMode = mode % 1000;
    epd->inputGainMode = mode / 10000;
    epd->HANGframe = -1;
    epd->hangLogEnabled = 1;
    epd->pcmDumpEnabled = pcmDumpEnabled;
    InitKEPD(&epd);
    InitNoiseEstimation(&epd);
    if (dumps(*epd)) {
      epd->inputDumpFile = open_dump(kDumpFolder, epd, kInputSuffix);
      epd->resultDumpFile = open_dump(kDumpFolder, epd, kResultSuffix);
    }
  }
  log_line(kLogDebug, kLogTag, "TQE: libOrvalis.so version %s %s in EPD Create, EPD MODE : %d",
           kVersion, "IS127", mode);
  return epd;
}

Word32 EPD_Proc_Frame(EpdInstance *epd, const Word16 *pcm, Word32 numSample, Word32 contentType,
                      EpdReasons &reasons) {
  reasons = {};
  if (epd == nullptr) return -1;
  log_format(*epd, numSample);
  const DumpFilesPresent dump_files(dumps(*epd), epd, kInputSuffix, kResultSuffix);
  PublishedFlags<PlainCopy> flags;
  PublishedFlags<NsCopy> ns_flags;

  const Word32 length = frame_length(*epd);
  Word32 running = epd->processedSamples;
  Word16 abnormal_check_count = epd->abnormalCheckCount;
  Word32 small_samples = 0;  // adds up over the frames of a call
  Word32 result = 0;
  for (Word32 rest = numSample; rest > 0; rest -= length, pcm += length) {
    if (rest < length) return 0;  // a partial frame: the call's samples are not counted
    count_up(running, length);
    if (is_null_frame(pcm, length, small_samples)) {
      log_line(kLogDebug, kLogTag, "TQE: Null Check fail ... dont do EPD!");
      continue;
    }
    Word16 unsuppressed[kMaxFrameSamples];
    std::copy_n(pcm, length, unsuppressed);
    apply_input_gain(epd->inputGainMode, unsuppressed, length);
    const bool settled = audio_settled(abnormal_check_count, running, length,
                                       small_samples < kAbnormalSmallSamples, kSettlingTexts);
    Word16 frame[kMaxFrameSamples];
    std::copy_n(unsuppressed, length, frame);
    if (settled && epd->rateMode == 0) s1chns_C(*ns_flags, &epd->suppressor, frame, frame);
    EpdInstance *handle = epd;  // its address is taken, so that epd can stay in a register
    const Word32 decision =
        KEPDfunc(*flags, &handle, frame, static_cast<std::uint32_t>(contentType), reasons);
    follow_decision(epd, unsuppressed, decision, reasons);
    if (decision != kNoSpeech) result = 1;
  }
  epd->processedSamples = running;
  epd->abnormalCheckCount = abnormal_check_count;
  return result;
}

Word32 reset_ALL_EPDparams(EpdInstance *epd) {
  if (epd == nullptr) return -1;
  epd->HANGframe = 0;
  epd->hangLogEnabled = 1;
  return KEPDfunc_Reset(&epd);
}

Word32 changeLogSetting(EpdInstance *epd) {
  epd->hangLogEnabled = 0;
  log_line(kLogDebug, kLogTag, "TQE: EPD(%li) LOG is disabled before ResetEPD", handle_number(epd));
  return 0;
}

Word32 freeMemory_EPD(EpdInstance *epd) {
  log_line(kLogDebug, kLogTag, "TQE: free EPD memory id : %li", handle_number(epd));
  if (epd == nullptr || handle_number(epd) == -1) return -1;
  if (dumps(*epd)) {
    close_dump(epd->inputDumpFile);
    close_dump(epd->resultDumpFile);
  }
  CloseKEPD(&epd);
  std::free(epd);
  return 0;
}

}  // namespace orvalis
