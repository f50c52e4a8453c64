#include "framework/host/xmlutil.h"

#include <libxml/tree.h>

#include <iterator>
#include <new>

namespace {

// libxml2 keeps an element's local name in `name` and its namespace apart, so comparing
// `name` ignores both default namespaces and prefixes.
bool HasLocalName(const xmlNode* node, const std::string& name) {
  return node->type == XML_ELEMENT_NODE && node->name != nullptr &&
         name == reinterpret_cast<const char*>(node->name);
}

xmlNode* FirstChildNamed(xmlNode* parent, const std::string& name) {
  for (xmlNode* child = parent->children; child != nullptr; child = child->next) {
    if (HasLocalName(child, name)) return child;
  }
  return nullptr;
}

}  // namespace

int FindXmlKeyVal(_xmlDoc* doc, std::list<std::string>& path, std::string& value) {
  if (doc == nullptr || path.empty()) return -1;
  xmlNode* node = xmlDocGetRootElement(doc);
  if (node == nullptr || !HasLocalName(node, path.front())) return -1;
  for (auto name = std::next(path.begin()); name != path.end(); ++name) {
    node = FirstChildNamed(node, *name);
    if (node == nullptr) return -1;
  }
  xmlChar* content = xmlNodeGetContent(node);
  try {
    value = content != nullptr ? reinterpret_cast<const char*>(content) : "";
  } catch (const std::bad_alloc&) {
    xmlFree(content);
    return -1;
  }
  xmlFree(content);
  return 0;
}

std::mutex& XmlLock() {
  static std::mutex lock;
  return lock;
}
