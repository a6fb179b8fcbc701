#ifndef KARNET_STATE_RUN_CONTEXT_H_
#define KARNET_STATE_RUN_CONTEXT_H_

namespace karnet {

struct RunSettings;
class Cartography;
class Report;

// What every phase of a run reads besides the run's arrays: the validated
// settings, the map projection, where report lines go and how many threads
// the computing phases may use. The run driver makes it once, after run
// setup, and hands it down; nothing in it changes during the run.
struct RunContext {
  const RunSettings& settings;
  Report& report;
  // The run's map projection; null only where a caller needs none (tests).
  const Cartography* cartography = nullptr;
  // Threads of the layer loops, at least 1.
  int threads = 1;
};

}  // namespace karnet

#endif  // KARNET_STATE_RUN_CONTEXT_H_
