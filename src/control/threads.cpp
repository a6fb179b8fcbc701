// How many threads the computation uses and how it shares them out.
#include "control/threads.h"

#include <omp.h>

#include <algorithm>

namespace karnet {

int defaultThreadCount() { return std::max(omp_get_max_threads(), 1); }

ThreadShare shareThreads(int threads, long long layerCount) {
  threads = std::max(threads, 1);
  layerCount = std::max(layerCount, 1LL);
  // With `layers` layer threads the pass takes ceil(layerCount / layers)
  // rounds, each as long as a layer on `rows` threads. A layer has a part that
  // one thread does (the estimators' copy, smoothing), taken as a tenth of it.
  // The share with the shortest pass wins, and of equal ones that with more
  // layer threads.
  constexpr double kSerialPart = 0.1;
  ThreadShare best;
  double bestTime = static_cast<double>(layerCount);  // one thread: every layer in turn
  const int most = static_cast<int>(std::min<long long>(threads, layerCount));
  for (int layers = 1; layers <= most; ++layers) {
    const int rows = threads / layers;
    const long long rounds = (layerCount + layers - 1) / layers;
    const double time =
        static_cast<double>(rounds) * (kSerialPart + (1.0 - kSerialPart) / rows);
    if (time <= bestTime * (1.0 + 1e-9)) {
      best = ThreadShare{layers, rows};
      bestTime = time;
    }
  }
  return best;
}

void allowNestedTeams() {
  if (omp_get_max_active_levels() < 2) omp_set_max_active_levels(2);
}

}  // namespace karnet
