// What malloc gives to the library: memory with known dirt in it, or none. Needs --wrap=malloc.
#pragma once

#include <cstddef>
#include <cstring>

namespace orvalis::test {

/// In force while it lives.
class ScriptedMalloc {
public:
  /// Every block comes filled with this byte.
  static ScriptedMalloc filling(int byte) { return ScriptedMalloc(kWithoutEnd, byte); }
  /// The first `granted` calls succeed, then none.
  static ScriptedMalloc failing(int granted = 0) { return ScriptedMalloc(granted, 0); }
  ~ScriptedMalloc() { current = nullptr; }
  ScriptedMalloc(const ScriptedMalloc &) = delete;
  ScriptedMalloc &operator=(const ScriptedMalloc &) = delete;

  /// Whether this call gets memory.
  bool grants() { return granted_ == kWithoutEnd || (granted_ > 0 && granted_-- > 0); }

  const int fill;
  static inline ScriptedMalloc *current = nullptr;

private:
  static constexpr int kWithoutEnd = -1;
  ScriptedMalloc(int granted, int fill_) : fill(fill_), granted_(granted) { current = this; }

  int granted_;
};

extern "C" void *__real_malloc(std::size_t size);
extern "C" __attribute__((used)) inline void *__wrap_malloc(std::size_t size) {
  ScriptedMalloc *script = ScriptedMalloc::current;
  if (script == nullptr) return __real_malloc(size);
  void *block = script->grants() ? __real_malloc(size) : nullptr;
  if (block != nullptr) std::memset(block, script->fill, size);
  return block;
}

}  // namespace orvalis::test
