// AIRLIVEV1EID: the digital-input query cases, with the Airlive input CGI.

#include "detectors/airlive.h"

#include "tests/detectors/inputquery_cases.h"

namespace evtest {

struct AirliveInputs {
  using Detector = AIRLIVEV1EID;
  static constexpr const char* kPrefix = "/io/input.cgi?checkactive=";
  // Read with the shared key/value check: an empty line ends the answer.
  static constexpr bool kEmptyLineEndsScan = true;
};

INSTANTIATE_TYPED_TEST_SUITE_P(Airlive, InputQueryTest, AirliveInputs);

}  // namespace evtest
