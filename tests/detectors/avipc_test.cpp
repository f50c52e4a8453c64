// AVIPCEID: the digital-input query cases, with the Avipc input CGI.

#include "detectors/avipc.h"

#include "tests/detectors/inputquery_cases.h"

namespace evtest {

struct AvipcInputs {
  using Detector = AVIPCEID;
  static constexpr const char* kPrefix = "/cgi-bin/io/input.cgi?checkactive=";
  // Read with the shared key/value check: an empty line ends the answer.
  static constexpr bool kEmptyLineEndsScan = true;
};

INSTANTIATE_TYPED_TEST_SUITE_P(Avipc, InputQueryTest, AvipcInputs);

}  // namespace evtest
