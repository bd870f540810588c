// `orvalis epd` and `orvalis vad`: the utterances of each file, by one detector or the other.
#include <orvalis.h>

#include <algorithm>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "cli/commands.h"
#include "cli/detect.h"
#include "cli/jobs.h"
#include "cli/options.h"

namespace orvalis::cli {
namespace {

struct DetectOptions {
  std::vector<std::string> files;
  DetectSettings settings;
  std::string format = "table";
  std::size_t jobs = 1;
  bool log = false;
  std::string dump_folder;
};

/// Refuses a format that does not hold what is reported. A trace is printed as csv unless a format
/// is given.
void check_format(const CLI::App &command, DetectOptions &options) {
  const Reported reported = options.settings.detector.reported;
  if (reported == Reported::kTrace && command.count("--format") == 0) options.format = "csv";
  const auto format = std::ranges::find(report_formats(), options.format, &ReportFormat::name);
  const auto refuse = [&](const char *option, const char *what) {
    throw CLI::ValidationError(option, "the format " + options.format + " holds no " + what);
  };
  if (reported == Reported::kFrames && !format->rows) refuse("--frames", "frames");
  if (reported == Reported::kStatistics && !format->rows) refuse("--stats", "statistics");
  if (reported == Reported::kTrace && !format->trace) refuse("--trace", "trace; use csv or json");
}

int run_detection(const CLI::App &command, DetectOptions &options, Console &console) {
  check_inputs(options.files);
  check_format(command, options);
  const auto report = make_report(options.format, "--format", options.files.size(), console);
  ProtectedFiles inputs(options.files);
  SplitSettings &split = options.settings.detector.split;
  split.rules.protected_files = &inputs;
  prepare_split(split, options.files);
  std::optional<Dump> dump;
  if (!options.dump_folder.empty()) {
    if (options.files.size() > 1)
      throw CLI::ValidationError("--dump", "several files are given, but only one can be dumped");
    options.settings.dump = &dump.emplace(options.dump_folder);
    options.settings.detector.stream.pcm_dump = 1;
  }
  if (options.log) console.show_engine_log();

  return process_files(options.files, options.jobs, console, [&](Job &job) {
    ReportInTurn in_turn(*report, job);
    detect(job, options.settings, in_turn);
  });
}

CLI::App *add_command(CLI::App &app, const char *name, const char *summary, DetectOptions &options,
                      Run &run) {
  CLI::App *command = app.add_subcommand(name, summary);
  add_files_option(*command, options.files);
  add_report_option(*command, "-f,--format", options.format);
  add_quiet_option(*command, run.console);
  return command;
}

/// Adds an option for each of what may be reported instead of utterances, one at a time.
/// `of_utterances`: the options that mean nothing if it is frames.
void add_reported_options(CLI::App &command, Reported &reported, bool frames,
                          const std::vector<CLI::Option *> &of_utterances) {
  std::vector<CLI::Option *> added;
  const auto add = [&](const char *name, Reported what, const char *text) {
    CLI::Option *option = command.add_flag_callback(
        name, [&reported, what] { reported = what; }, text);
    for (CLI::Option *other : added) option->excludes(other);
    if (is_frames(what))
      for (CLI::Option *other : of_utterances) option->excludes(other);
    added.push_back(option);
  };
  add("--silences", Reported::kSilences, "Print what lies between the utterances instead");
  add("--stats", Reported::kStatistics,
      "Print one line for each file instead: its length,\nspeech, utterances and clipped samples");
  if (frames)
    add("--frames", Reported::kFrames,
        "Print the decision on each frame of 10 ms instead\nof utterances");
  add("--trace", Reported::kTrace,
      "Print the decision on each frame and what led to\nit, as csv or json");
}

constexpr const char *kEpdNotes = R"(Input:
  Each utterance is printed as soon as it is decided. Nothing is decided before the
  first 10 s are there, except with --raw - or --no-lead-in.

Files of utterances:
  --split clips writes the utterances of take.wav to clips/take-001.wav,
  clips/take-002.wav and so on: the samples of the input, with its rate, channels and
  sample format. For standard input they are the samples that the engine was given, in
  clips/stdin-001.wav and so on.

Output:
  Times are seconds of the input. "start" and "end" are the borders of the
  utterance; "began" and "ended" are the times of the detector's first and last
  decision for speech. "open" marks an utterance that was still going on when the
  audio ended.
    table     for a reader
    json      one object per line; *_sample fields count samples at its "rate"
    csv       for a spreadsheet
    labels    a label track for Audacity (one file)
    textgrid  an interval tier for Praat (one file, written at its end)
    rttm      SPEAKER lines for diarisation tools

Input formats, times and exit status: orvalis help input

Examples:
  orvalis epd meeting.wav
  orvalis epd --format json --hangover 800 a.flac b.mp3
  orvalis epd --pad-before 0 --pad-after 0 --channel 2 call.wav
  orvalis epd --raw --rate 8000 line.raw
  orvalis epd --split clips --pad-before 300 --pad-after 400 meeting.wav
  orvalis epd --jobs 4 --format csv *.flac >all.csv
  orvalis epd --stats *.flac
  orvalis epd --format labels take.wav >take.txt
  arecord -q -t raw -f S16_LE -r 16000 -c 1 | orvalis epd --raw -)";

void add_epd_command(CLI::App &app, Run &run) {
  const auto options = std::make_shared<DetectOptions>();
  DetectorSettings &detector = options->settings.detector;
  CLI::App *epd =
      add_command(app, "epd", "Find the utterances in audio files or live audio", *options, run);
  epd->footer(kEpdNotes);
  const UtteranceOptions utterances = add_utterance_options(*epd, detector);
  epd->add_option_function<std::string>(
         "--gain",
         [&detector](const std::string &gain) {
           detector.stream.input_gain = gain == "0.25" ? 1 : gain == "4" ? 2 : 0;
         },
         "Gain of the input: 0.25, 1 or 4 (wraps beyond 16 bits)")
      ->check(one_of({"0.25", "1", "4"}))
      ->type_name("G")
      ->default_str("1");
  epd->add_flag("--force", detector.split.rules.may_replace, "Replace existing files")
      ->needs(utterances.split);
  epd->add_flag("--sync", detector.split.rules.sync,
                "Have files on the disk before they get their names")
      ->needs(utterances.split);
  add_reported_options(*epd, detector.reported, true, utterances.all);
  auto *jobs = add_jobs_option(*epd, options->jobs);
  epd->add_flag("--log", options->log, "Show the engine's log lines on standard error")
      ->excludes(jobs);
  epd->add_option("--dump", options->dump_folder,
                  "Let the engine write its dump files below this\nfolder (of one file)")
      ->check(not_empty())
      ->type_name("DIR");
  add_audio_options(*epd, options->settings.audio);
  epd->callback(
      [options, epd, &run] { run.exit_status = run_detection(*epd, *options, run.console); });
}

constexpr const char *kVadNotes =
    R"(This detector estimates the noise in each bin of the spectrum, and decides on frames
of 160 samples: 10 ms at 16 kHz, 20 ms at 8 kHz. Other rates are resampled to 16 kHz.

By default the noise estimate may only fall. That covers words best, but background
that becomes more than 3 dB louder counts as speech from then on. With --history it may
rise as well, and words are found in parts, which --min-silence joins.

Output:
  As for epd (orvalis help epd). "start" and "end" are the borders of a segment;
  "began" and "ended" are the times of the detector's first and last decision for
  speech.

Trace:
  energy, smoothed_energy, minimum_energy and speech_bins are those of a frame and its
  predecessor together. A frame is speech if energy exceeds energy_threshold,
  smoothed_energy exceeds smoothed_threshold, and speech_bins exceeds
  speech_bins_threshold.

Examples:
  orvalis vad meeting.wav
  orvalis vad --format json --min-silence 500 --pad-before 0 a.flac b.mp3
  orvalis vad --trace meeting.wav >trace.csv
  arecord -q -t raw -f S16_LE -r 16000 -c 1 | orvalis vad --history --raw -)";

void add_mcra_options(CLI::App &vad, McraSettings &mcra) {
  vad.add_flag_callback(
      "--history", [&mcra] { mcra.historyUpdate = 1; },
      "Let the noise estimate rise as well as fall: its\nminima are those of 20 frames");
  vad.add_option("--energy-margin", mcra.energyMargin, "Factor of the smoothed-energy test")
      ->check(from_to(0, 1000000))
      ->type_name("N")
      ->capture_default_str();
  vad.add_flag_callback(
      "--margin-over-minima", [&mcra] { mcra.calibrationEnable = 1; },
      "Apply the margin to the energy of the minima");
  vad.add_flag_callback(
      "--low-threshold", [&mcra] { mcra.lowThresholdSelect = 1; },
      "Minimum energy threshold 0.097 instead of 0.1");
  vad.add_flag_callback(
      "--calibrate", [&mcra] { mcra.calibrationMode = mcra.calibrationEnable = 1; },
      "Learn the energy threshold from frames 80 to 294;\nimplies --margin-over-minima");
  vad.add_option("--exponent", mcra.exponent, "Exponent of the learnt threshold")
      ->check(from_to(0.01, 2.0))
      ->type_name("X")
      ->default_str("0.84");
}

void add_vad_command(CLI::App &app, Run &run) {
  const auto options = std::make_shared<DetectOptions>();
  DetectorSettings &detector = options->settings.detector;
  detector.stream.detector = UTTERANCE_MCRA;
  detector.stream.min_speech_ms = 100;
  CLI::App *vad =
      add_command(app, "vad", "Find segments of speech with the MCRA detector", *options, run);
  vad->footer(kVadNotes);
  std::vector<CLI::Option *> times = {
      add_time_option(*vad, "--min-speech", detector.stream.min_speech_ms,
                      "Shortest segment that is reported"),
      add_time_option(*vad, "--min-silence", detector.min_silence_ms,
                      "Shortest silence that separates two segments")};
  for (CLI::Option *padding : add_padding_options(*vad, detector.stream, "segment"))
    times.push_back(padding);
  add_reported_options(*vad, detector.reported, false, times);
  add_mcra_options(*vad, detector.mcra);
  add_jobs_option(*vad, options->jobs);
  add_audio_options(*vad, options->settings.audio);
  vad->callback(
      [options, vad, &run] { run.exit_status = run_detection(*vad, *options, run.console); });
}

}  // namespace

void add_detect_commands(CLI::App &app, Run &run) {
  add_epd_command(app, run);
  add_vad_command(app, run);
}

}  // namespace orvalis::cli
