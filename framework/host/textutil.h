// Small text helpers of the host: key/value lookup, number to text, time difference.
// Pure functions; safe from any thread.

#ifndef EVWATCH_FRAMEWORK_HOST_TEXTUTIL_H_
#define EVWATCH_FRAMEWORK_HOST_TEXTUTIL_H_

#include <sys/time.h>

#include <string>

// Looks key up in text made of entries separated by `separator`, each entry being
// name, `assign`, value. Matching rule: an entry matches when its name, with blanks and
// tabs around it removed, equals key exactly (case-sensitive); a CR before the separator and
// blanks around the value are dropped. The first matching entry wins. Returns 0 and sets
// value when found; -1 and leaves value untouched otherwise (also for empty assign or
// separator).
int FindKeyVal(std::string text, std::string key, std::string& value, const char* assign,
               const char* separator);

// Decimal text of a number.
std::string itos(long long value);

// later - earlier, in microseconds.
long long TimevalDiff(const timeval& earlier, const timeval& later);

#endif  // EVWATCH_FRAMEWORK_HOST_TEXTUTIL_H_
