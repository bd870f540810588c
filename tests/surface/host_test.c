/* A C host that reads and writes the flags by name. Built at a fixed position (the flags then lie
 * in the program's own image), as a position-independent program, and opening the library at run
 * time: all three must share the engine's flags, and print the same. host_test <RECORDING    (raw
 * 16-bit PCM, 16 kHz) */
#include "Voice_Engine/basic_op/basic_op.h"
#include "Voice_Engine/epd/fixed_fft.h"
#include "jni/orvalis.h"
#include "tests/support/read_pcm.h"

#ifdef HOST_OPENS_LIBRARY
#include <dlfcn.h>
#include <stdlib.h>

static void *symbol(const char *name) {
  void *library = dlopen(HOST_OPENS_LIBRARY, RTLD_NOW | RTLD_LOCAL);
  void *address = library == NULL ? NULL : dlsym(library, name);
  if (address != NULL) return address;
  fprintf(stderr, "%s\n", dlerror());
  exit(2);
}

#define IN_LIBRARY(name) (*(__extension__(__typeof__(name) *) symbol(#name)))
#define Overflow         IN_LIBRARY(Overflow)
#define Carry            IN_LIBRARY(Carry)
#define ns_Overflow      IN_LIBRARY(ns_Overflow)
#define ns_Carry         IN_LIBRARY(ns_Carry)
#define Overflow_ZOLT    IN_LIBRARY(Overflow_ZOLT)
#define add              IN_LIBRARY(add)
#define L_add            IN_LIBRARY(L_add)
#define L_ns_add         IN_LIBRARY(L_ns_add)
#define L_sat            IN_LIBRARY(L_sat)
#define ZOLT_L_sub       IN_LIBRARY(ZOLT_L_sub)
#define phs_tbl          IN_LIBRARY(phs_tbl)
#define phs_tbl_WB       IN_LIBRARY(phs_tbl_WB)
#define InitializeEPD    IN_LIBRARY(InitializeEPD)
#define ProcessEPDFrame  IN_LIBRARY(ProcessEPDFrame)
#define FreeMemoryEPD    IN_LIBRARY(FreeMemoryEPD)
#endif

static int failures = 0;

static void expect(int32_t got, int32_t wanted, const char *what) {
  if (got == wanted) return;
  printf("%s: %d, not %d\n", what, (int)got, (int)wanted);
  ++failures;
}

/* A value that no operator leaves behind. */
enum { kPoison = 77 };

static void operators(void) {
  Overflow = kPoison;
  ns_Overflow = kPoison;
  expect(L_add(INT32_MAX, 1), INT32_MAX, "L_add");
  expect(Overflow, 1, "Overflow after L_add");
  expect(ns_Overflow, kPoison, "ns_Overflow after L_add");
  expect(add(1, 2), 3, "add");
  expect(Overflow, 0, "Overflow after add");
  expect(L_ns_add(INT32_MIN, -1), INT32_MIN, "L_ns_add");
  expect(ns_Overflow, 1, "ns_Overflow after L_ns_add");
  expect(Overflow, 0, "Overflow after L_ns_add");
  expect(ZOLT_L_sub(INT32_MIN, 1), INT32_MIN, "ZOLT_L_sub");
  expect(Overflow_ZOLT, 1, "Overflow_ZOLT after ZOLT_L_sub");

  /* The engine reads what the host writes. */
  Overflow = 1;
  Carry = 1;
  expect(L_sat(5), INT32_MIN, "L_sat with flags of the host");
  expect(Overflow + Carry, 0, "flags after L_sat");
  for (int i = 0; i < 256; ++i) expect(phs_tbl[0][i], phs_tbl_WB[i], "entry of phs_tbl[0]");
}

static void frames(int32_t samples) {
  EpdInstance *epd = InitializeEPD(0, 0);
  int32_t judged = 0;
  int32_t raised[2] = {0, 0};
  for (int32_t at = 0; at + 160 <= samples; at += 160, ++judged) {
    Overflow = kPoison;
    ns_Overflow = kPoison;
    if (ProcessEPDFrame(epd, pcm + at, 160) < 0) ++failures;
    expect(Overflow == 0 || Overflow == 1, 1, "Overflow after ProcessEPDFrame is a flag");
    if (judged >= 20) expect(ns_Overflow == 0 || ns_Overflow == 1, 1, "ns_Overflow likewise");
    raised[0] += Overflow;
    raised[1] += judged < 20 ? 0 : ns_Overflow;
  }
  printf("%d frames, %d with Overflow, %d with ns_Overflow\n", (int)judged, (int)raised[0],
         (int)raised[1]);
  expect(FreeMemoryEPD(epd), 0, "FreeMemoryEPD");
}

int main(void) {
  operators();
  frames(read_pcm());
  return failures != 0;
}
