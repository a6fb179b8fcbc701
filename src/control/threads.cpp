// How many threads the computation uses and how it shares them out.
#include "control/threads.h"

#include <omp.h>

#include <algorithm>

namespace karnet {

int defaultThreadCount() { return std::max(omp_get_max_threads(), 1); }

ThreadShare shareThreads(int threads, long long layerCount) {
  ThreadShare share;
  threads = std::max(threads, 1);
  share.layers = static_cast<int>(std::clamp<long long>(layerCount, 1, threads));
  share.rows = std::max(threads / share.layers, 1);
  return share;
}

void allowNestedTeams() {
  if (omp_get_max_active_levels() < 2) omp_set_max_active_levels(2);
}

}  // namespace karnet
