// The detector class registry: for every detector class of the library, its maker, what it
// watches, its constructor, which configuration fields that constructor takes, how it asks
// the camera, and a factory that builds it from a camera's objects and the entry's fields.
//
// Adding a class is one row in registry.cpp (and the include of its header); the
// configuration checks, `evwatch classes` and the runner follow from the row.
//
// Threads: the table is built once and read-only after that.

#ifndef EVWATCH_APPS_EVWATCH_REGISTRY_H_
#define EVWATCH_APPS_EVWATCH_REGISTRY_H_

#include <functional>
#include <memory>
#include <string>
#include <string_view>
#include <vector>

#include "framework/detector.h"

class Camera;
class CameraAPI;
class StreamBuffer;

namespace evwatch {

// kInputLevel: an input detector whose reading carries a level (100 while active) instead of
// a validity flag. kBoth: motion or input by the entry's type (0: motion); kBothLevel: the
// same, the input reading also carrying a level.
enum class DetectorKind { kMotion, kInput, kInputLevel, kBoth, kBothLevel };

// "motion", "input", "input (level)" or "motion+input".
const char* KindName(DetectorKind kind);

// Configuration fields of a detector entry that a constructor may take (bit flags).
enum ConfigField : unsigned {
  kFieldInputs = 1u << 0,         // inputs: the int constructor argument
  kFieldFunctionGroup = 1u << 1,  // function_group: VIVO_FUNC_GR / PANA_FUNC_GR
  kFieldType = 1u << 2,           // type: EVENT_DET_TYPE
  kFieldStreamBuffer = 1u << 3,   // stream_buffer: the camera's frame buffer or null
  kFieldApi = 1u << 4,            // the camera's CameraAPI (from its api: block)
};

// Everything a factory may hand to a constructor. The pointers belong to the caller and
// outlive the detector.
struct DetectorArgs {
  Camera* camera = nullptr;
  CameraAPI* api = nullptr;
  StreamBuffer* stream_buffer = nullptr;
  int inputs = 1;
  int function_group = 0;
  int type = 0;
};

struct DetectorClass {
  std::string name;         // the class name, exact case
  std::string maker;
  DetectorKind kind;
  std::string constructor;  // "CanonEID(Camera*, int inputs)"
  unsigned fields;          // ConfigField bits of the constructor's arguments
  std::string how;          // how the camera is asked, in one line
  std::function<std::unique_ptr<EventDetector>(const DetectorArgs&)> make;
  bool counts_inputs = false;  // `inputs` is how many inputs it watches (0 or below: none)

  bool Takes(ConfigField field) const { return (fields & field) != 0; }
};

// Every registered class, in a fixed order (by maker, then class).
const std::vector<DetectorClass>& DetectorClasses();
// The class of exactly that name, or null.
const DetectorClass* FindDetectorClass(std::string_view name);

// Case-insensitive edit distance (a swap of two neighbours counts as one edit), used to suggest the nearest name for a misspelt one.
int EditDistance(std::string_view a, std::string_view b);
// The candidate nearest to `name`; empty when there are no candidates.
std::string NearestName(std::string_view name, const std::vector<std::string>& candidates);

}  // namespace evwatch

#endif  // EVWATCH_APPS_EVWATCH_REGISTRY_H_
