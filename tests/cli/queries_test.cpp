// `orvalis energy` and `orvalis spectrum` against the library's own functions.
#include <gtest/gtest.h>

#include <array>
#include <string>
#include <vector>

#include "jni/orvalis.h"
#include "tests/cli/tool.h"
#include "tests/support/recordings.h"

namespace orvalis::test {
namespace {

using Queries = Tool;

TEST_F(Queries, AnswerForEveryWholeBlock) {
  const struct {
    std::string command, file, field;
    std::size_t block, bins;
  } kCases[] = {{"energy", kWideOpen, "energy", 320, 1},
                {"spectrum", kWideOpen, "power", 160, 128},
                {"spectrum", kNarrow, "power", 80, 64}};
  for (const auto &[command, file, field, block, bins] : kCases) {
    SCOPED_TRACE(command + " " + file);
    const int rate_hz = file == kNarrow ? 8000 : 16000;
    const Pcm pcm = load_recording(file);
    const auto lines = json_lines(run(command + " --format json " + file).out);
    ASSERT_EQ(lines.size(), pcm.size() / block) << "a remainder is no block";
    std::string csv = bins == 1 ? "start,energy" : "start";
    for (std::size_t i = 0; bins > 1 && i < bins; ++i) csv += ",bin" + std::to_string(i);
    for (std::size_t i = 0; i < lines.size(); ++i) {
      std::vector<std::int32_t> values(bins);
      if (bins > 1) getSpectrum(&pcm[i * block], values.data(), rate_hz);
      if (bins == 1) values = {computeEnergy(&pcm[i * block], static_cast<std::int32_t>(block))};
      const double start = static_cast<double>(i * block) / rate_hz;
      ASSERT_EQ(lines[i],
                (Json{{"start", start}, {field, bins > 1 ? Json(values) : Json(values[0])}}));
      std::array<char, 20> text;
      std::snprintf(text.data(), text.size(), "\n%.2f", start);
      csv += text.data();
      for (const std::int32_t value : values) (csv += ",") += std::to_string(value);
    }
    EXPECT_EQ(run(command + " " + file).out, csv + "\n");
  }
}

}  // namespace
}  // namespace orvalis::test
