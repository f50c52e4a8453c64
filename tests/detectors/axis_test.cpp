// AXISEID: the digital-input query cases, with the Axis input CGI.

#include "detectors/axis.h"

#include "tests/detectors/inputquery_cases.h"

namespace evtest {

struct AxisInputs {
  using Detector = AXISEID;
  static constexpr const char* kPrefix = "/axis-cgi/io/input.cgi?checkactive=";
  // Read with the Axis-family line check: empty lines count towards the ten.
  static constexpr bool kEmptyLineEndsScan = false;
};

INSTANTIATE_TYPED_TEST_SUITE_P(Axis, InputQueryTest, AxisInputs);

}  // namespace evtest
