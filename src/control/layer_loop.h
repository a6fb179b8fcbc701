#ifndef KARNET_CONTROL_LAYER_LOOP_H_
#define KARNET_CONTROL_LAYER_LOOP_H_

#include <cstdint>
#include <exception>
#include <optional>
#include <utility>

#include "control/progress.h"

namespace karnet {

// Runs body(s, workspace) for the layers s = first .. end - 1 on `threads`
// threads, each layer once, in any order. Each thread makes its own Workspace
// (from workspaceArguments) when it takes its first layer and keeps it for the
// next. Progress counts one item per layer and is shown by the driving thread,
// which also watches for a cancel until every layer is done; after a stop
// (cancel, interrupt, an error in a layer) the layers not yet begun are passed
// over, and what stopped the work (for errors: that of the lowest layer) is
// rethrown here.
template <typename Workspace, typename Body, typename... Arguments>
void forEachLayer(std::int64_t first, std::int64_t end, int threads, WorkProgress& progress,
                  Body&& body, const Arguments&... workspaceArguments) {
#pragma omp parallel num_threads(threads) if (threads > 1)
  {
    std::optional<Workspace> workspace;
#pragma omp for schedule(dynamic, 1) nowait
    for (std::int64_t s = first; s < end; ++s) {
      if (progress.stopped()) {
        progress.itemDone();
        continue;
      }
      try {
        if (!workspace.has_value()) workspace.emplace(workspaceArguments...);
        body(s, *workspace);
      } catch (...) {
        progress.fail(std::current_exception(), s);
      }
      progress.itemDone();
      progress.poll();
    }
    progress.watchUntilDone(end > first ? end - first : 0);
  }
  progress.finish();
}

}  // namespace karnet

#endif  // KARNET_CONTROL_LAYER_LOOP_H_
