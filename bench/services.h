// The services as their callers have them, through the public interface.
#pragma once

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <memory>

#include "Voice_Engine/MCRAvad/MCRAvad.h"
#include "Voice_Engine/drc/dynamics_control.h"
#include "Voice_Engine/epd/epd_instance.h"
#include "Voice_Engine/ns/ns_instance.h"
#include "jni/orvalis.h"

namespace orvalis::bench {

/// Something that processes audio frame by frame.
class Service {
public:
  virtual ~Service() = default;
  virtual void start() = 0;  ///< makes it as new
  virtual void process(const std::int16_t *frame) = 0;
};

class Detection : public Service {
public:
  Detection(std::int32_t mode, std::int32_t samples) : mode_(mode), samples_(samples) {}
  void start() override { epd_.reset(InitializeEPD(mode_, 0)); }
  void process(const std::int16_t *frame) override { ProcessEPDFrame(epd_.get(), frame, samples_); }

private:
  std::int32_t mode_;
  std::int32_t samples_;
  std::unique_ptr<EpdInstance, decltype(&FreeMemoryEPD)> epd_{nullptr, FreeMemoryEPD};
};

class Suppression : public Service {
public:
  explicit Suppression(std::int32_t microphones) : microphones_(microphones) {}
  void start() override { ns_.reset(InitializeDoNS(ORVALIS_NS_13DB, microphones_, 0)); }
  void process(const std::int16_t *frame) override { suppressed(frame); }

  std::int16_t *suppressed(const std::int16_t *frame) {
    const std::int32_t samples = ORVALIS_FRAME_16K * microphones_;
    std::copy_n(frame, samples, frame_);
    ProcessDoNSFrame(ns_.get(), frame_, samples, frame_, samples);
    return frame_;
  }

private:
  std::int32_t microphones_;
  std::int16_t frame_[2 * ORVALIS_FRAME_16K] = {};
  std::unique_ptr<NsInstance, decltype(&FreeMemoryNS)> ns_{nullptr, FreeMemoryNS};
};

class DynamicsControl : public Service {
public:
  ~DynamicsControl() override { stop(); }
  void start() override {
    stop();
    drc_ = InitializeDRC(16000, 0);
  }
  void process(const std::int16_t *frame) override {
    std::copy_n(frame, ORVALIS_FRAME_16K, frame_);
    level(frame_);
  }

  void level(std::int16_t *frame) { ProcessDRC(drc_, frame, ORVALIS_FRAME_16K); }

private:
  void stop() {
    if (drc_ != 0) FreeMemoryDRC(drc_);
  }

  std::int64_t drc_ = 0;
  std::int16_t frame_[ORVALIS_FRAME_16K] = {};
};

/// Suppresses, levels, and looks for utterances in the result.
class AllInARow : public Service {
public:
  void start() override {
    suppression_.start();
    dynamics_.start();
    detection_.start();
  }
  void process(const std::int16_t *frame) override {
    std::int16_t *clean = suppression_.suppressed(frame);
    dynamics_.level(clean);
    detection_.process(clean);
  }

private:
  Suppression suppression_{1};
  DynamicsControl dynamics_;
  Detection detection_{ORVALIS_EPD_16K, ORVALIS_FRAME_16K};
};

class McraDetection : public Service {
public:
  void start() override {
    VADINFO *record = record_.get();
    *record = {};
    initialVADINFO(&record);
  }
  void process(const std::int16_t *frame) override {
    VADINFO *record = record_.get();
    std::copy_n(frame, MCRA_FRAME_SAMPLES, frame_);
    processVAD(&record, frame_, MCRA_FRAME_SAMPLES, 0.84F);
  }

private:
  std::unique_ptr<VADINFO> record_ = std::make_unique<VADINFO>();
  std::int16_t frame_[MCRA_FRAME_SAMPLES] = {};
};

/// One service, and all there is to know about it.
struct ServiceKind {
  const char *name;
  int rate_hz;
  int microphones;
  bool has_bodies;    ///< for several instruction sets
  std::size_t bytes;  ///< of an instance
  std::unique_ptr<Service> (*create)();
};

template <class Kind, auto... kArguments>
std::unique_ptr<Service> create() {
  return std::make_unique<Kind>(kArguments...);
}

inline constexpr ServiceKind kDetection16{"end-point detection, 16 kHz",
                                          16000,
                                          1,
                                          true,
                                          sizeof(EpdInstance),
                                          create<Detection, ORVALIS_EPD_16K, ORVALIS_FRAME_16K>};
inline constexpr ServiceKind kDetection8{"end-point detection, 8 kHz",
                                         8000,
                                         1,
                                         true,
                                         sizeof(EpdInstance),
                                         create<Detection, ORVALIS_EPD_8K, ORVALIS_FRAME_8K>};
inline constexpr ServiceKind kOneMicrophone{
    "suppression, 1 microphone", 16000, 1, true, sizeof(NsInstance), create<Suppression, 1>};
inline constexpr ServiceKind kTwoMicrophones{
    "suppression, 2 microphones", 16000, 2, false, sizeof(NsInstance) + sizeof(S2chnsState),
    create<Suppression, 2>};
inline constexpr ServiceKind kDynamicsControl{
    "dynamics control", 16000, 1, true, sizeof(DrcInstance), create<DynamicsControl>};
inline constexpr ServiceKind kAllInARow{
    "these three in a row",
    16000,
    1,
    true,
    sizeof(NsInstance) + sizeof(DrcInstance) + sizeof(EpdInstance),
    create<AllInARow>};
inline constexpr ServiceKind kMcraDetection{"MCRA detection",     16000, 1, false, sizeof(VADINFO),
                                            create<McraDetection>};

}  // namespace orvalis::bench
