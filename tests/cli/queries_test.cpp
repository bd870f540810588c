// `orvalis energy` and `orvalis spectrum` against the library's own functions.
#include <gtest/gtest.h>

#include <nlohmann/json.hpp>
#include <sstream>
#include <string>
#include <vector>

#include "jni/orvalis.h"
#include "tests/support/child_process.h"
#include "tests/support/recordings.h"
#include "tests/support/temporary_folder.h"

namespace orvalis::test {
namespace {

/// Runs a query in both formats and compares each line with `values(first sample)`.
template <class Values>
void expect_answers(const std::string &command, const std::string &name, double step_s,
                    std::size_t lines, const std::string &field, Values values) {
  SCOPED_TRACE(command);
  const TemporaryFolder folder;
  const auto output = [&](const std::string &format) {
    ChildProcess child(ORVALIS_TOOL_PATH " " + command + " --format " + format + " " + name,
                       folder.path());
    EXPECT_EQ(child.finish(), 0) << child.errors();
    return std::istringstream(child.output());
  };
  auto csv = output("csv"), json = output("json");
  std::string row, object;
  std::getline(csv, row);
  EXPECT_EQ(row.rfind("start,", 0), 0u);
  for (std::size_t i = 0; i < lines; ++i) {
    ASSERT_TRUE(std::getline(csv, row) && std::getline(json, object)) << i;
    const std::vector<std::int32_t> expected = values(i);
    std::istringstream cells(row);
    std::string cell;
    std::getline(cells, cell, ',');
    ASSERT_NEAR(std::stod(cell), step_s * static_cast<double>(i), 1e-9);
    for (const std::int32_t value : expected) {
      ASSERT_TRUE(std::getline(cells, cell, ','));
      ASSERT_EQ(std::stol(cell), value) << i;
    }
    ASSERT_FALSE(std::getline(cells, cell, ',')) << i;
    const auto fields = nlohmann::json::parse(object);
    ASSERT_EQ(fields["start"], std::stod(row));
    if (expected.size() == 1) {
      ASSERT_EQ(fields[field], expected[0]);
    } else {
      ASSERT_EQ(fields[field], expected);
    }
  }
  EXPECT_FALSE(std::getline(csv, row)) << "a remainder is no block";
}

TEST(Queries, AnswerForEveryWholeBlock) {
  const std::string wide = ORVALIS_SPEECH_16K "/cards/001.wav";
  const std::string narrow = ORVALIS_SPEECH_8K "/wav/big_dog.wav";
  const Pcm wide_pcm = load_recording(wide), narrow_pcm = load_recording(narrow);
  expect_answers("energy", wide, 0.02, wide_pcm.size() / 320, "energy", [&](std::size_t i) {
    return std::vector{computeEnergy(&wide_pcm[i * 320], 320)};
  });
  expect_answers("spectrum", wide, 0.01, wide_pcm.size() / 160, "power", [&](std::size_t i) {
    std::vector<std::int32_t> bins(128);
    getSpectrum(&wide_pcm[i * 160], bins.data(), 16000);
    return bins;
  });
  expect_answers("spectrum", narrow, 0.01, narrow_pcm.size() / 80, "power", [&](std::size_t i) {
    std::vector<std::int32_t> bins(64);
    getSpectrum(&narrow_pcm[i * 80], bins.data(), 8000);
    return bins;
  });
}

}  // namespace
}  // namespace orvalis::test
