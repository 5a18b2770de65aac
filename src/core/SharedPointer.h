#pragma once

// A counted pointer of one word for nodes that carry their own count. Message
// values are stored by the million; two words for each shared part of them
// would cost more memory than the parts themselves.

#include <atomic>
#include <cstdint>
#include <utility>

namespace tal {

/// The count. A derived node is made with one owner.
class SharedNode {
 public:
  SharedNode() = default;
  SharedNode(const SharedNode&) = delete;
  SharedNode& operator=(const SharedNode&) = delete;

  void retain() const { references_.fetch_add(1, std::memory_order_relaxed); }

  /// True when the caller was the last owner and must destroy the node.
  bool release() const {
    // The single owner needs no atomic write: nobody else can take a reference.
    return isUnique() || references_.fetch_sub(1, std::memory_order_acq_rel) == 1;
  }

  bool isUnique() const { return references_.load(std::memory_order_acquire) == 1; }

 private:
  mutable std::atomic<std::uint32_t> references_{1};
};

/// Owns one reference to a node; `Node::destroy(const Node*)` ends it.
template <typename Node>
class SharedPointer {
 public:
  SharedPointer() = default;
  SharedPointer(const SharedPointer& other) : node_(other.node_) {
    if (node_) node_->retain();
  }
  SharedPointer(SharedPointer&& other) noexcept : node_(std::exchange(other.node_, nullptr)) {}
  SharedPointer& operator=(SharedPointer other) noexcept {
    std::swap(node_, other.node_);
    return *this;
  }
  ~SharedPointer() { reset(); }

  /// Takes over the reference that the caller holds.
  static SharedPointer adopt(Node* node) {
    SharedPointer pointer;
    pointer.node_ = node;
    return pointer;
  }

  /// Takes one more reference.
  static SharedPointer share(Node* node) {
    if (node) node->retain();
    return adopt(node);
  }

  void reset() {
    if (Node* node = std::exchange(node_, nullptr); node && node->release()) Node::destroy(node);
  }

  /// Hands the reference to the caller.
  Node* detach() { return std::exchange(node_, nullptr); }

  Node* get() const { return node_; }
  Node* operator->() const { return node_; }
  Node& operator*() const { return *node_; }
  explicit operator bool() const { return node_ != nullptr; }

 private:
  Node* node_ = nullptr;
};

}  // namespace tal
