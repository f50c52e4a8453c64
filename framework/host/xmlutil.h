// Element lookup in a parsed libxml2 document.
//
// Threads: safe on distinct documents from any number of threads. libxml2's global
// clean-up (xmlCleanupParser) may be called by detectors while other threads parse: see
// XmlLock below.

#ifndef EVWATCH_FRAMEWORK_HOST_XMLUTIL_H_
#define EVWATCH_FRAMEWORK_HOST_XMLUTIL_H_

#include <list>
#include <mutex>
#include <string>

struct _xmlDoc;

// Walks path from the document's root: the first name must be the root element's, each
// further name the first child element of that name. Names compare by local name, so a
// document with a default namespace (or prefixes) matches plain names. The found
// element's text content goes to value. Returns 0 when found, -1 otherwise (null document,
// empty path, a missing element).
int FindXmlKeyVal(_xmlDoc* doc, std::list<std::string>& path, std::string& value);

// The process-wide lock under which the detector library parses, frees and cleans up
// libxml2 documents, so that xmlCleanupParser() never runs while another thread is inside
// libxml2.
std::mutex& XmlLock();

#endif  // EVWATCH_FRAMEWORK_HOST_XMLUTIL_H_
