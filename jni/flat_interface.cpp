// The flat C interface: checks arguments, then forwards. The core behind it trusts them.
#include <cstdint>

#include "Voice_Engine/drc/dynamics_control.h"
#include "Voice_Engine/epd/epd_instance.h"
#include "Voice_Engine/epd/queries.h"
#include "Voice_Engine/ns/ns_instance.h"
#include "Voice_Engine/platform/dump_file.h"
#include "Voice_Engine/platform/export.h"
#include "Voice_Engine/platform/log.h"
#include "Voice_Engine/platform/version.h"
#include "jni/orvalis.h"

namespace {

// What the frame calls of the detector share.
int32_t process_frames(EpdInstance *epd, const int16_t *pcm, int32_t numSample, int32_t contentType,
                       EpdReasons *wanted = nullptr) {
  if (pcm == nullptr && numSample > 0) return -1;
  EpdReasons reasons;
  const int32_t result = orvalis::EPD_Proc_Frame(epd, pcm, numSample, contentType, reasons);
  if (wanted != nullptr) *wanted = reasons;
  return result;
}

constinit orvalis::S2chnsState process_wide_pair{};  // shared by all two-microphone suppressors

constexpr int64_t kNoDrc = -1;

/// Null for a number that is no handle.
DrcInstance *drc_of(int64_t handle) {
  return handle == kNoDrc ? nullptr
                          : reinterpret_cast<DrcInstance *>(static_cast<intptr_t>(handle));
}

}  // namespace

extern "C" {

ORVALIS_EXPORT const char *GetVersion(void) { return orvalis::kVersion; }

ORVALIS_EXPORT int32_t OrvalisAbiVersion(void) { return ORVALIS_ABI_VERSION; }

ORVALIS_EXPORT EpdInstance *InitializeEPD(int32_t mode, int32_t pcmDumpEnabled) {
  return orvalis::EPD_Create(mode, pcmDumpEnabled);
}

ORVALIS_EXPORT int32_t ProcessEPDFrameByCnttype(EpdInstance *epd, const int16_t *pcm,
                                                int32_t numSample, int32_t contentType) {
  return process_frames(epd, pcm, numSample, contentType);
}

ORVALIS_EXPORT int32_t ProcessEPDFrameByMode(EpdInstance *epd, const int16_t *pcm,
                                             int32_t numSample, int32_t mode) {
  return process_frames(epd, pcm, numSample, mode);
}

ORVALIS_EXPORT int32_t ProcessEPDFrameExplained(EpdInstance *epd, const int16_t *pcm,
                                                int32_t numSample, int32_t contentType,
                                                EpdReasons *reasons) {
  return process_frames(epd, pcm, numSample, contentType, reasons);
}

ORVALIS_EXPORT int32_t ProcessEPDFrame(EpdInstance *epd, const int16_t *pcm, int32_t numSample) {
  if (epd == nullptr) return -1;
  return process_frames(epd, pcm, numSample, epd->rateMode);
}

ORVALIS_EXPORT int32_t ResetEPDparams(EpdInstance *epd) {
  return orvalis::reset_ALL_EPDparams(epd);
}

ORVALIS_EXPORT int32_t setLogging(EpdInstance *epd, int32_t /*value*/) {
  if (epd == nullptr) return -1;
  return orvalis::changeLogSetting(epd);
}

ORVALIS_EXPORT int32_t FreeMemoryEPD(EpdInstance *epd) { return orvalis::freeMemory_EPD(epd); }

ORVALIS_EXPORT NsInstance *InitializeDoNS(int32_t mode, int32_t micCount, int32_t /*unused*/) {
  return orvalis::DoNS_Create(mode, micCount, process_wide_pair);
}

ORVALIS_EXPORT int32_t ProcessDoNSFrame(NsInstance *ns, int16_t *in, int32_t numIn, int16_t *out,
                                        int32_t numOut) {
  if (numIn > 0 && (in == nullptr || out == nullptr)) return -1;
  return orvalis::DO_NS_Proc_Frame(ns, process_wide_pair, in, numIn, out, numOut);
}

ORVALIS_EXPORT int32_t FreeMemoryNS(NsInstance *ns) { return orvalis::freeMemory_NS(ns); }

ORVALIS_EXPORT int64_t InitializeDRC(int32_t samplingRate, int32_t pcmDumpEnabled) {
  const DrcInstance *drc = orvalis::create_drc(samplingRate, pcmDumpEnabled);
  return drc == nullptr ? kNoDrc : reinterpret_cast<intptr_t>(drc);
}

ORVALIS_EXPORT int32_t ProcessDRC(int64_t drc, int16_t *pcm, int32_t numSample) {
  if (pcm == nullptr && numSample > 0) return -1;
  return orvalis::process_drc(drc_of(drc), pcm, numSample);
}

ORVALIS_EXPORT int32_t FreeMemoryDRC(int64_t drc) { return orvalis::freeMemory_DRC(drc_of(drc)); }

ORVALIS_EXPORT int32_t computeEnergy(const int16_t *pcm, int32_t n) {
  return pcm == nullptr ? 0 : orvalis::block_energy_db(pcm, n);
}

ORVALIS_EXPORT int32_t ComputeEnergy(const int16_t *pcm, int32_t numSample, int32_t samplingRate) {
  return pcm == nullptr ? 0 : orvalis::largest_energy_db(pcm, numSample, samplingRate);
}

ORVALIS_EXPORT int32_t getSpectrum(const int16_t *pcm, int32_t *spectrum, int32_t samplingRate) {
  if (pcm == nullptr || spectrum == nullptr) return 0;
  orvalis::PublishedFlags<orvalis::PlainCopy> flags;
  return orvalis::getFrameSpectrum(*flags, pcm, spectrum, samplingRate == 16000 ? 0 : 1);
}

ORVALIS_EXPORT void LogAllToStandardError(int priority, const char *tag, const char *text,
                                          void *user) {
  orvalis::log_all_to_standard_error(priority, tag, text, user);
}

ORVALIS_EXPORT void LogNothing(int, const char *, const char *, void *) {}

ORVALIS_EXPORT void SetLogSink(void (*sink)(int priority, const char *tag, const char *text,
                                            void *user),
                               void *user) {
  // The engine's own function, which it knows not to format lines for.
  orvalis::set_log_sink(sink == LogNothing ? orvalis::log_nothing : sink, user);
}

ORVALIS_EXPORT int32_t SetDumpRoot(const char *directory) {
  return orvalis::set_dump_root(directory) ? 0 : -1;
}

}  // extern "C"
