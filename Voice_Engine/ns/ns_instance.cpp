#include "Voice_Engine/ns/ns_instance.h"

#include <cstdlib>

#include "Voice_Engine/channel/frame_screening.h"
#include "Voice_Engine/platform/dump_file.h"
#include "Voice_Engine/platform/log.h"
#include "Voice_Engine/platform/version.h"

namespace orvalis {
namespace {

constexpr char kInputSuffix[] = "_beforeNS.pcm";
constexpr char kResultSuffix[] = "_afterNS.pcm";
constexpr Word32 kUnsupported = 0;  // a frame length: one microphone at 8 kHz
constexpr SettlingTexts kSettlingTexts = {
    .abnormal = "TQE: Check Abnormal Audio ... dont do NS ... in DoNS_Proc_Frame",
    .waiting =
        "TQE: Check Abnormal Audio ... wait few more frame ... dont do NS ... in "
        "DoNS_Proc_Frame",
};

bool dumps(const NsInstance &ns) { return ns.pcmDumpEnabled == 1; }

Word32 frame_length(const NsInstance &ns) {
  if (ns.micCount == 2) return 2 * kHop;
  switch (ns.rateMode) {
    case 0:
      return 160;
    case 1:
      return kUnsupported;
    case 2:
      return 320;
    default:
      return 80;
  }
}

void log_version(Word32 suppressor_mode) {
  log_line(kLogDebug, kLogTag, "TQE: libOrvalis.so version %s %s in doNS, NS MODE : %d", kVersion,
           "IS127", suppressor_mode);
}

void initialise_suppressor(NsInstance *ns, S2chnsState &pair, Word16 suppressor_mode) {
  if (ns->micCount == 1) {
    log_line(kLogDebug, kLogTag, "TQE: DoNS_Create 1Mic NS Initialize");
    S1CHNSInit(&ns->suppressor, suppressor_mode);
  } else if (ns->micCount == 2) {
    log_line(kLogDebug, kLogTag, "TQE: DoNS_Create 2Mic NS Initialize");
    S2CHNSInit(pair);
  }
}

/// Suppresses one frame; false if the instance suppresses nothing.
bool suppress(NsInstance *ns, S2chnsState &pair, Word16 *in, Word16 *out, Flags &flags) {
  if (ns->micCount == 1) {
    s1chns_C(flags, &ns->suppressor, in, out);
  } else if (ns->micCount == 2) {
    S2CHNSProcessNSFrame(pair, in, out, kHop);
  } else {
    return false;
  }
  return true;
}

}  // namespace

NsInstance *DoNS_Create(Word32 mode, Word32 micCount, S2chnsState &pair) {
  auto *ns = static_cast<NsInstance *>(std::calloc(1, sizeof(NsInstance)));
  if (ns == nullptr) {
    log_version(0);
    return nullptr;
  }
  ns->processedSamples = 0;
  ns->abnormalCheckCount = 0;
  ns->pcmDumpEnabled = 0;
  ns->reserved = 0;
  ns->micCount = micCount;
  ns->rateMode = (mode / 1000) % 10;
  ns->inputDumpFile = nullptr;
  ns->resultDumpFile = nullptr;
  const Word16 suppressor_mode = mode % 1000 == 2 ? 2 : 0;
  initialise_suppressor(ns, pair, suppressor_mode);
  if (dumps(*ns)) {
    ns->inputDumpFile = open_dump(kDumpFolder, ns, kInputSuffix);
    ns->resultDumpFile = open_dump(kDumpFolder, ns, kResultSuffix);
  }
  log_version(suppressor_mode);
  return ns;
}

Word32 DO_NS_Proc_Frame(NsInstance *ns, S2chnsState &pair, Word16 *in, Word32 numIn, Word16 *out,
                        Word32 numOut) {
  if (ns == nullptr || numIn != numOut) return -1;
  const Word32 length = frame_length(*ns);
  if (length == kUnsupported) return -1;
  if (numIn % length != 0) {
    log_line(kLogError, kLogTag, "TQE: Check pcm buffer size : numInSample = %d, PCM_LEN = %d",
             numIn, length);
  }
  if (ns->processedSamples == 0)
    log_line(kLogDebug, kLogTag, "TQE: with DoNS ... numInSample = %d ", numIn);
  const DumpFilesPresent dump_files(dumps(*ns), ns, kInputSuffix, kResultSuffix);
  PublishedFlags<NsCopy> flags;

  const Word32 abnormal_small_samples = 3 * length / 4;
  Word32 small_samples = 0;  // adds up over the frames of a call
  for (Word32 rest = numIn; rest > 0; rest -= length, in += length, out += length) {
    if (dumps(*ns)) write_dump(ns->inputDumpFile, in, length);
    count_up(ns->processedSamples, length);
    if (is_null_frame(in, length, small_samples)) {
      log_line(kLogDebug, kLogTag, "TQE: Audio Null Check fail ... dont do NS !");
      continue;
    }
    const bool is_normal = small_samples < abnormal_small_samples;
    if (!audio_settled(ns->abnormalCheckCount, ns->processedSamples, length, is_normal,
                       kSettlingTexts))
      continue;
    if (suppress(ns, pair, in, out, *flags) && dumps(*ns))
      write_dump(ns->resultDumpFile, out, length);
  }
  return ns->processedSamples;
}

Word32 freeMemory_NS(NsInstance *ns) {
  log_line(kLogDebug, kLogTag, "TQE: free NS memory id : %li", handle_number(ns));
  if (ns == nullptr || handle_number(ns) == -1) return -1;
  if (dumps(*ns)) {
    close_dump(ns->inputDumpFile);
    close_dump(ns->resultDumpFile);
  }
  std::free(ns);
  return 0;
}

}  // namespace orvalis
