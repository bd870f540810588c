// Decides when the library runs out of memory. Needs --wrap=malloc and --wrap=calloc.
#pragma once

#include <cstddef>

namespace orvalis::test {

/// In effect during its lifetime.
class ScriptedMalloc {
public:
  /// The first `granted` calls succeed, then none.
  static ScriptedMalloc failing(int granted = 0) { return ScriptedMalloc(granted); }
  ~ScriptedMalloc() { current = nullptr; }
  ScriptedMalloc(const ScriptedMalloc &) = delete;
  ScriptedMalloc &operator=(const ScriptedMalloc &) = delete;

  /// Whether this call gets memory.
  static bool grants() { return current == nullptr || current->granted_-- > 0; }

private:
  explicit ScriptedMalloc(int granted) : granted_(granted) { current = this; }

  int granted_;
  static inline ScriptedMalloc *current = nullptr;
};

extern "C" void *__real_malloc(std::size_t size);
extern "C" __attribute__((used)) inline void *__wrap_malloc(std::size_t size) {
  return ScriptedMalloc::grants() ? __real_malloc(size) : nullptr;
}
extern "C" void *__real_calloc(std::size_t count, std::size_t size);
extern "C" __attribute__((used)) inline void *__wrap_calloc(std::size_t count, std::size_t size) {
  return ScriptedMalloc::grants() ? __real_calloc(count, size) : nullptr;
}

}  // namespace orvalis::test
