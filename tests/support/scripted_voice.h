// Speaks for the voice detector, so that a test can say which frames hold voice. Needs --wrap with
// the mangled name below; without a script the real detector answers.
#pragma once

#include <vector>

#include "Voice_Engine/epd/velmora_vad.h"

namespace orvalis::test {

/// In force while it lives.
class ScriptedVoice {
public:
  ScriptedVoice() { current = this; }
  ~ScriptedVoice() { current = nullptr; }
  ScriptedVoice(const ScriptedVoice &) = delete;
  ScriptedVoice &operator=(const ScriptedVoice &) = delete;

  void says(bool voiced) { flag = answer = voiced; }

  Word32 flag = 0;    ///< decision before the energy gate
  Word32 answer = 0;  ///< and behind it
  std::vector<Word16> heard_frame;
  float heard_score = -1;
  static inline ScriptedVoice *current = nullptr;
};

#define ORVALIS_DETECTOR(prefix) \
  prefix##_ZN7orvalis17processVelmoraVADERNS_5FlagsEPPNS_15VelmoraVadStateEPKsPKfi

extern "C" Word32 ORVALIS_DETECTOR(__real_)(Flags &, VelmoraVadState **, const Word16 *,
                                            const float *, Word32);
extern "C" __attribute__((used)) inline Word32 ORVALIS_DETECTOR(__wrap_)(
    Flags &flags, VelmoraVadState **state, const Word16 *frame, const float *score, Word32 band) {
  ScriptedVoice *script = ScriptedVoice::current;
  if (script == nullptr) return ORVALIS_DETECTOR(__real_)(flags, state, frame, score, band);
  script->heard_frame.assign(frame, frame + (band == 0 ? 160 : 80));
  script->heard_score = *score;
  (*state)->vad_flag = script->flag;
  return script->answer;
}

#undef ORVALIS_DETECTOR

}  // namespace orvalis::test
