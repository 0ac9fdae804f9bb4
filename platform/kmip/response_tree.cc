#include "platform/kmip/response_tree.h"

namespace Qlc {
namespace {

void LinkNode(Node* node, const Tree* tree) {
  node->tree = tree;
  for (size_t i = 0; i < node->children.size(); ++i) {
    node->children[i].next = i + 1 < node->children.size() ? &node->children[i + 1] : nullptr;
    LinkNode(&node->children[i], tree);
  }
}

}  // namespace

void Tree::Link() { LinkNode(&root, this); }

const Node* FindPath(const Node& from, std::string_view path, std::string* error) {
  const Node* node = &from;
  size_t start = 0;
  while (start < path.size()) {
    size_t slash = path.find('/', start);
    std::string_view part = path.substr(
        start, slash == std::string_view::npos ? std::string_view::npos : slash - start);
    if (part.empty()) {
      *error = "empty name in path '" + std::string(path) + "'";
      return nullptr;
    }
    const Node* found = nullptr;
    for (const Node& child : node->children) {
      if (child.name == part) {
        found = &child;
        break;
      }
    }
    if (found == nullptr) {
      *error = "no '" + std::string(path.substr(0, start + part.size())) + "' in the response";
      return nullptr;
    }
    node = found;
    if (slash == std::string_view::npos) return node;
    start = slash + 1;
    if (start == path.size()) {
      if (node->children.empty()) {
        *error = "'" + std::string(path.substr(0, slash)) + "' has no entries in the response";
        return nullptr;
      }
      return &node->children.front();
    }
  }
  return node;
}

}  // namespace Qlc
