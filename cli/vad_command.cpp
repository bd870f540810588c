#include "cli/vad_command.h"

#include <algorithm>
#include <memory>
#include <string>
#include <vector>

#include "cli/audio_options.h"
#include "cli/detector_options.h"
#include "cli/report_in_turn.h"
#include "cli/voice_detection.h"
#include "cli/work_files.h"

namespace orvalis::cli {
namespace {

struct VadOptions {
  std::vector<std::string> files;
  VoiceSettings voice;
  std::string format = "table";
  std::size_t jobs = 1;
};

int run_vad(const CLI::App &command, VadOptions &options) {
  if (std::ranges::count(options.files, "-") > 1)
    throw CLI::ValidationError("FILE", "standard input can be read only once");
  if (options.voice.trace) options.format = trace_format(command, options.format);
  const auto report = make_report(options.format, "--format", options.files.size());
  return work_files(options.files, {.jobs = options.jobs},
                    [&](std::size_t job, Turn &turn, const Advanced &advanced) {
                      ReportInTurn in_turn(*report, turn);
                      detect_voice(options.files[job], options.voice, in_turn, advanced);
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
  exceeds smoothed_threshold and speech_bins exceeds 40.

Examples:
  orvalis vad meeting.wav
  orvalis vad --format json --min-silence 500 --pad-before 100 a.flac b.mp3
  orvalis vad --trace meeting.wav >trace.csv
  arecord -q -t raw -f S16_LE -r 16000 -c 1 | orvalis vad --history --raw -)";

void add_detector_settings(CLI::App &vad, VoiceSettings &voice) {
  vad.add_flag("--history", voice.history,
               "Let the noise rise as well as fall: its minima\nare those of 20 frames");
  vad.add_option("--energy-margin", voice.energy_margin, "Factor of the smoothed-energy test")
      ->check(from_to(0, 1000000))
      ->type_name("N")
      ->capture_default_str();
  vad.add_flag("--margin-over-minima", voice.margin_over_minima,
               "Count the margin in the energy of the minima");
  vad.add_flag("--low-threshold", voice.low_threshold,
               "Least energy threshold 0.097 instead of 0.1");
  vad.add_flag("--calibrate", voice.calibrate,
               "Learn the energy threshold from frames 80\nto 294; implies --margin-over-minima");
  vad.add_option("--exponent", voice.exponent, "Exponent of the threshold that is learnt")
      ->check(CLI::Range(0.01, 2.0).description(""))
      ->type_name("X")
      ->default_str("0.84");
}

}  // namespace

void add_vad_command(CLI::App &app, int &exit_status) {
  const auto options = std::make_shared<VadOptions>();
  VoiceSettings &voice = options->voice;
  CLI::App *vad = app.add_subcommand("vad", "Find segments of speech by the MCRA detector");
  vad->footer(kNotes);
  vad->add_option("FILE", options->files, "Audio files; \"-\" is standard input")
      ->required()
      ->type_name("");
  add_report_option(*vad, "--format", options->format);

  auto *min_speech =
      vad->add_option("--min-speech", voice.min_speech_ms, "Leave out segments that are shorter");
  auto *min_silence =
      vad->add_option("--min-silence", voice.min_silence_ms, "Join what shorter silence cuts");
  auto *before =
      vad->add_option("--pad-before", voice.pad_before_ms, "Time to add before a segment");
  auto *after = vad->add_option("--pad-after", voice.pad_after_ms, "Time to add after a segment");
  auto *trace = vad->add_flag("--trace", voice.trace,
                              "Print what led to the answer to every frame,\nas csv or json");
  for (CLI::Option *option : {min_speech, min_silence, before, after}) {
    option->check(from_to(0, 3600 * 1000))->type_name("MS")->capture_default_str();
    trace->excludes(option);
  }
  add_detector_settings(*vad, voice);
  vad->add_option("--jobs", options->jobs, "Files to work on at once")
      ->check(from_to(1, 256))
      ->type_name("N")
      ->capture_default_str();
  add_audio_options(*vad, voice.audio);
  vad->callback([options, vad, &exit_status] { exit_status = run_vad(*vad, *options); });
}

}  // namespace orvalis::cli
