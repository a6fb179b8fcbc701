// Choice of the data cells that inform one node.
#include "analysis/select_data.h"

#include <cmath>
#include <utility>

#include "analysis/correlation.h"

namespace karnet {
namespace {

// True when corr[i] must move behind corr[i + gap]: it is smaller (equal values
// stay). A not-a-number correlation (a cell on the node when a distance scale
// is 0) ranks above every number, like the distance 0 it stands for; without a
// rank it would be exchanged in every pass and the sort would never end.
bool ranksBelow(float a, float b) {
  if (std::isnan(a)) return false;
  if (std::isnan(b)) return true;
  return a < b;
}

}  // namespace

void sortByCorrelation(float* corr, std::int32_t* index, std::int32_t n) {
  if (n < 2) return;
  std::int32_t gap = n / 2;
  for (;;) {
    bool exchanged = true;
    while (exchanged) {
      exchanged = false;
      for (std::int32_t i = 0; i < n - gap; ++i) {
        if (ranksBelow(corr[i], corr[i + gap])) {
          std::swap(corr[i], corr[i + gap]);
          std::swap(index[i], index[i + gap]);
          exchanged = true;
        }
      }
    }
    if (gap <= 1) break;
    gap /= 2;
  }
}

std::int32_t selectData(OaWorkspace& ws, std::int32_t j, std::int32_t k,
                        const RunSettings& settings) {
  const float radius2 =
      settings.SearchRadius * settings.SearchRadius / settings.dx / settings.dx;
  const float nodeX = static_cast<float>(j);
  const float nodeY = static_cast<float>(k);

  std::int32_t count = 0;
  for (std::int32_t i = 0; i < ws.dataCount; ++i) {
    const float ddy = nodeY - ws.dataY[i];
    const float ddx = nodeX - ws.dataX[i];
    const float d2 = ddy * ddy + ddx * ddx;
    if (d2 > radius2) continue;
    ws.candIndex[count] = i;
    ws.candCorr[count] = correlation(d2, ws);
    ++count;
  }

  std::int32_t kept = count;
  if (count > ws.limit) {
    sortByCorrelation(ws.candCorr, ws.candIndex, count);
    kept = ws.limit > 0 ? ws.limit : 0;
  }
  for (std::int32_t p = 0; p < kept; ++p) {
    const std::int32_t i = ws.candIndex[p];
    ws.selX[p] = ws.dataX[i];
    ws.selY[p] = ws.dataY[i];
    ws.selValue[p] = ws.dataValue[i];
    ws.selCorr[p] = ws.candCorr[p];
  }
  return kept;
}

}  // namespace karnet
