#ifndef KARNET_INTERP_NODE_TESTS_H_
#define KARNET_INTERP_NODE_TESTS_H_

namespace karnet {

// A value cell is empty when it holds the delete value; the 32-bit cell is
// widened and compared with the 64-bit delete value of the result description.
inline bool isEmptyCell(float cell, double deleteValue) {
  return static_cast<double>(cell) == deleteValue;
}

// A bathymetry cell is dry when it holds the land value (widened comparison).
inline bool isDryCell(float bed, double landValue) {
  return static_cast<double>(bed) == landValue;
}

}  // namespace karnet

#endif  // KARNET_INTERP_NODE_TESTS_H_
