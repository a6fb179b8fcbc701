#ifndef KARNET_CONTROL_CROSS_VALIDATE_REQUEST_H_
#define KARNET_CONTROL_CROSS_VALIDATE_REQUEST_H_

#include <string>
#include <vector>

namespace karnet {

// One keyword of the objective analysis and the values a sweep tries for it.
struct SweepKeyword {
  std::string name;            // as the parameter file spells it
  std::vector<double> values;  // in the order given
};

// What the command line asks of a cross-validation.
struct CrossValidationRequest {
  bool active = false;              // --cross-validate or --sweep given
  std::vector<SweepKeyword> sweep;  // empty: the parameter file's values only
};

}  // namespace karnet

#endif  // KARNET_CONTROL_CROSS_VALIDATE_REQUEST_H_
