// Tables that are exported under short, common names.
//
// A host may define the same name, so the library reads a hidden name, of which the exported one is
// an alias.
#pragma once

#include "Voice_Engine/platform/export.h"

/// Declares `orvalis_<name>`, the hidden name that the library itself reads.
#define ORVALIS_HIDDEN_TABLE(type, name) \
  extern "C" __attribute__((visibility("hidden"))) const type orvalis_##name

/// Exports a hidden table as `name`, in the file that defines it.
#define ORVALIS_EXPORT_TABLE(type, name) \
  extern "C" ORVALIS_EXPORT __attribute__((alias("orvalis_" #name))) const type name
