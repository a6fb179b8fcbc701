#ifndef KARNET_ANALYSIS_SELECT_DATA_H_
#define KARNET_ANALYSIS_SELECT_DATA_H_

#include <cstdint>

#include "analysis/workspace.h"
#include "params/run_settings.h"

namespace karnet {

// Sorts corr[0..n-1] into descending order with a diminishing-gap exchange
// sort, applying every exchange to index as well. Equal values are never
// exchanged, so the order of exchanges decides which of equal values come
// first. Nothing happens when n < 2.
void sortByCorrelation(float* corr, std::int32_t* index, std::int32_t n);

// Chooses the data cells for node (j, k): every cell of ws.dataX/dataY/
// dataValue (ws.dataCount of them) within SearchRadius becomes a candidate; when
// there are more than ws.limit candidates the best-correlated ws.limit are kept,
// otherwise all in collection order. Fills selIndex, selX, selY, selValue,
// selCorr and returns their number m (0 <= m <= limit).
std::int32_t selectData(OaWorkspace& ws, std::int32_t j, std::int32_t k,
                        const RunSettings& settings);

}  // namespace karnet

#endif  // KARNET_ANALYSIS_SELECT_DATA_H_
