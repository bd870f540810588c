#include "cli/vad_command.h"

#include <algorithm>
#include <memory>
#include <string>
#include <vector>

#include "cli/audio_options.h"
#include "cli/detection.h"
#include "cli/detector_options.h"
#include "cli/report_in_turn.h"
#include "cli/work_files.h"

namespace orvalis::cli {
namespace {

struct VadOptions {
  std::vector<std::string> files;
  DetectionSettings detection;
  bool history = false, low_threshold = false, margin_over_minima = false, calibrate = false;
  bool trace = false;
  std::string format = "table";
  std::size_t jobs = 1;
};

int run_vad(const CLI::App &command, VadOptions &options) {
  if (std::ranges::count(options.files, "-") > 1)
    throw CLI::ValidationError("FILE", "standard input can be read only once");
  if (options.trace) {
    options.format = trace_format(command, options.format);
    options.detection.reported = Reported::kTrace;
  }
  McraSettings &mcra = options.detection.mcra;
  mcra.historyUpdate = options.history;
  mcra.lowThresholdSelect = options.low_threshold;
  mcra.calibrationMode = options.calibrate;
  mcra.calibrationEnable = options.calibrate || options.margin_over_minima;
  const auto report = make_report(options.format, "--format", options.files.size());
  return work_files(options.files, {.jobs = options.jobs},
                    [&](std::size_t job, Turn &turn, const Advanced &advanced) {
                      ReportInTurn in_turn(*report, turn);
                      detect(options.files[job], options.detection, in_turn, advanced);
                    });
}

constexpr const char *kNotes =
    R"(This detector is another one than that of the command epd. It follows the noise
in every bin of the spectrum and answers frames of 160 samples: 10 ms at 16 kHz, 20 ms
at 8 kHz. Input of other rates is resampled to 16 kHz.

By default the noise may only fall, which covers words best; what becomes more than
3 dB louder and stays so counts as speech. With --history noise may rise, and words are
found in pieces: --min-silence joins them.

Output:
  As that of epd. "start" and "end" are the borders of a segment; "began" and "ended"
  tell when the detector gave its first and last answer "speech".

Trace:
  energy, smoothed_energy, minimum_energy and speech_bins are those of a frame and its
  predecessor. A frame is speech if energy exceeds energy_threshold, smoothed_energy
  exceeds smoothed_threshold and speech_bins exceeds
  speech_bins_threshold.

Examples:
  orvalis vad meeting.wav
  orvalis vad --format json --min-silence 500 --pad-before 0 a.flac b.mp3
  orvalis vad --trace meeting.wav >trace.csv
  arecord -q -t raw -f S16_LE -r 16000 -c 1 | orvalis vad --history --raw -)";

void add_mcra_options(CLI::App &vad, VadOptions &options) {
  McraSettings &mcra = options.detection.mcra;
  vad.add_flag("--history", options.history,
               "Let the noise rise as well as fall: its minima\nare those of 20 frames");
  vad.add_option("--energy-margin", mcra.energyMargin, "Factor of the smoothed-energy test")
      ->check(from_to(0, 1000000))
      ->type_name("N")
      ->capture_default_str();
  vad.add_flag("--margin-over-minima", options.margin_over_minima,
               "Count the margin in the energy of the minima");
  vad.add_flag("--low-threshold", options.low_threshold,
               "Least energy threshold 0.097 instead of 0.1");
  vad.add_flag("--calibrate", options.calibrate,
               "Learn the energy threshold from frames 80\nto 294; implies --margin-over-minima");
  vad.add_option("--exponent", mcra.exponent, "Exponent of the threshold that is learnt")
      ->check(CLI::Range(0.01, 2.0).description(""))
      ->type_name("X")
      ->default_str("0.84");
}

}  // namespace

void add_vad_command(CLI::App &app, int &exit_status) {
  const auto options = std::make_shared<VadOptions>();
  UtteranceSettings &detector = options->detection.detector;
  detector.detector = UTTERANCE_MCRA;
  detector.min_speech_ms = 100;
  CLI::App *vad = app.add_subcommand("vad", "Find segments of speech by the MCRA detector");
  vad->footer(kNotes);
  vad->add_option("FILE", options->files, "Audio files; \"-\" is standard input")
      ->required()
      ->type_name("");
  add_report_option(*vad, "--format", options->format);

  const std::vector<CLI::Option *> times = {
      add_time_option(*vad, "--min-speech", detector.min_speech_ms,
                      "Leave out segments that are shorter"),
      add_time_option(*vad, "--min-silence", options->detection.min_silence_ms,
                      "Join what shorter silence cuts"),
      add_time_option(*vad, "--pad-before", detector.pad_before_ms, "Time to add before a segment"),
      add_time_option(*vad, "--pad-after", detector.pad_after_ms, "Time to add after a segment")};
  auto *trace = vad->add_flag("--trace", options->trace,
                              "Print what led to the answer to every frame,\nas csv or json");
  for (CLI::Option *option : times) trace->excludes(option);
  add_mcra_options(*vad, *options);
  vad->add_option("--jobs", options->jobs, "Files to work on at once")
      ->check(from_to(1, 256))
      ->type_name("N")
      ->capture_default_str();
  add_audio_options(*vad, options->detection.audio);
  vad->callback([options, vad, &exit_status] { exit_status = run_vad(*vad, *options); });
}

}  // namespace orvalis::cli
