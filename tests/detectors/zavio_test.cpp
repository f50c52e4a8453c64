// ZavioEID: the digital-input query cases, with the Zavio input CGI.

#include "detectors/zavio.h"

#include "tests/detectors/inputquery_cases.h"

namespace evtest {

struct ZavioInputs {
  using Detector = ZavioEID;
  static constexpr const char* kPrefix = "/cgi-bin/admin/input?checkactive=";
  // Read with the Axis-family line check: empty lines count towards the ten.
  static constexpr bool kEmptyLineEndsScan = false;
};

INSTANTIATE_TYPED_TEST_SUITE_P(Zavio, InputQueryTest, ZavioInputs);

}  // namespace evtest
