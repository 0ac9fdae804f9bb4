// The decoded answer of a KMIP command as a tree of named nodes, addressed by
// slash-separated paths such as "Symmetric_Key/Key" or "Attributes/State".
// A path names children from the node it starts at; a trailing '/' steps to
// the first child of the node reached ("Versions/" is the first version). An
// empty path is the starting node itself.
//
// Nodes are the library's response nodes (qlc_node): each starts with the
// handle tag that tells the C surface what a pointer refers to. A tree is
// built once, never changed afterwards, and owned by one result; its nodes
// live as long as the tree.
#pragma once

#include <cstdint>
#include <memory>
#include <string>
#include <string_view>
#include <vector>

#include "platform/kmip/handle.h"
#include "platform/util/secure_buffer.h"

namespace Qlc {

struct Tree;

struct Node : qlc_handle {
  enum class Kind { kStructure, kInteger, kText, kBytes };

  Node() : qlc_handle{kNodeMagic} {}
  Node(std::string n, Kind k) : qlc_handle{kNodeMagic}, name(std::move(n)), kind(k) {}
  ~Node() { magic = 0; }
  Node(Node&&) = default;
  Node& operator=(Node&&) = default;

  Node& Add(std::string child_name, Kind child_kind) {
    return children.emplace_back(std::move(child_name), child_kind);
  }

  std::string name;
  Kind kind = Kind::kStructure;
  int64_t integer = 0;            // kInteger
  Groundwork::SecureBytes bytes;  // kText and kBytes
  std::vector<Node> children;     // kStructure
  const Node* next = nullptr;     // next sibling, set by Tree::Link
  const Tree* tree = nullptr;     // owning tree, set by Tree::Link
};

struct Tree {
  Node root;
  // Why the last look-up in this tree failed (reported by qlc_explain on a
  // successful result); written through const handles, so mutable.
  mutable std::string lookupError;

  // Sets the sibling and owner links; call once the tree is complete.
  void Link();
};

// The node at `path` below `from`, or null with `error` set.
const Node* FindPath(const Node& from, std::string_view path, std::string* error);

}  // namespace Qlc
