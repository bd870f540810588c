// The signal path: steps that take 16-bit samples in pieces of any size and give samples.
#pragma once

#include <cstdint>
#include <memory>
#include <span>
#include <vector>

namespace orvalis::cli {

class Stage {
public:
  virtual ~Stage() = default;

  /// Appends to `output` what can be said after `input`.
  virtual void push(std::span<const std::int16_t> input, std::vector<std::int16_t> &output) = 0;
  /// Ends the input and appends the rest.
  virtual void flush(std::vector<std::int16_t> &output) = 0;
};

/// Stages one after the other, as one.
class Chain : public Stage {
public:
  void add(std::unique_ptr<Stage> stage) { stages_.push_back(std::move(stage)); }

  void push(std::span<const std::int16_t> input, std::vector<std::int16_t> &output) override;
  void flush(std::vector<std::int16_t> &output) override;

private:
  std::vector<std::unique_ptr<Stage>> stages_;
  std::vector<std::int16_t> in_, out_;
};

}  // namespace orvalis::cli
