// The walk-through's chapters that live outside xavoprinter_demo.cc, and
// what they share with it.
#pragma once

#include <string>

#include "demo/stage.h"
#include "demo/walk.h"

namespace xavo::demo {

// "xavoprinter net add" for the printer at ip under the CUPS name, with
// what "net probe --json" found (its output); queue: the remote queue when
// the probe could not learn it.
std::string NetAddCommand(const std::string &ip, const std::string &name, const std::string &probeJson,
                          const std::string &queue = "");

// The IPP printer that only mDNS makes known: found, added, printed to.
void MdnsChapters(Walk &walk, Stage &stage);
// A probe where no printer answers, down to the BJNP backend.
void NobodyChapter(Walk &walk);

}  // namespace xavo::demo
