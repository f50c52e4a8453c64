// Element paths for XML lookups: "EventNotificationAlert/eventType" as the list of element
// names that FindXmlKeyVal walks. Pure function; safe from any thread.

#ifndef EVWATCH_FRAMEWORK_KEYPATH_H_
#define EVWATCH_FRAMEWORK_KEYPATH_H_

#include <list>
#include <string>

// Appends to `path` every piece of `key` before a "/", an empty one included (so a leading
// "/" or a "//" gives an empty name), then the rest after the last "/" when it is not empty
// (so a trailing "/" adds nothing).
void SplitKeyPath(const std::string& key, std::list<std::string>& path);

#endif  // EVWATCH_FRAMEWORK_KEYPATH_H_
