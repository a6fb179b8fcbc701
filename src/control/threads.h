#ifndef KARNET_CONTROL_THREADS_H_
#define KARNET_CONTROL_THREADS_H_

namespace karnet {

// Threads of the computation when neither --threads nor KARNET_THREADS names a
// number: what the OpenMP runtime offers, normally one per core.
int defaultThreadCount();

// How a loop over layers shares threads: `layers` threads each take whole
// layers, and each of them leads `rows` threads over the rows of its layer.
// layers * rows never exceeds threads; a run of few layers (one, say) still
// uses every thread on the rows. The share is the one with the shortest pass
// when a tenth of each layer's work is done by one thread.
struct ThreadShare {
  int layers = 1;
  int rows = 1;
};
ThreadShare shareThreads(int threads, long long layerCount);

// Lets the layer loops open their row teams inside the layer team.
void allowNestedTeams();

}  // namespace karnet

#endif  // KARNET_CONTROL_THREADS_H_
