// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

namespace tonewerk {

// Holds a JSON text as a tree of values in one array, in the order of the text: each array or object is
// directly followed by its elements. Meant for texts that are parsed often and then read once from beginning
// to end; a tree of maps costs twice as much.
class JsonTree {
 public:
  enum class Kind : std::uint8_t { kNull, kBoolean, kInteger, kUnsigned, kDouble, kText, kArray, kObject };
  // kNumberOutOfRange: a number is beyond the range of a double.
  enum class Failure { kNone, kNotJson, kNumberOutOfRange };

  struct Node {
    union {
      bool boolean;
      std::int64_t integer;           // negative ones
      std::uint64_t unsignedInteger;  // all others that 64 bits can hold
      double number;                  // what has a fraction or an exponent, or is larger
      std::uint64_t count;            // direct elements of an array or object
    };
    std::uint32_t span = 1;  // number of nodes: this one and all below it
    Kind kind = Kind::kNull;
    // Positions in text_.
    std::uint32_t keyBegin = 0;
    std::uint32_t keySize = 0;
    std::uint32_t textBegin = 0;
    std::uint32_t textSize = 0;
  };

  // `text` must be smaller than 4 GiB. After a failure the tree must not be used; if the text is not JSON,
  // `message` says where and why.
  [[nodiscard]] Failure parse(std::string_view text, std::string& message);

  const Node& root() const { return nodes_.front(); }
  // The key of an object's field; empty for other nodes.
  std::string_view keyOf(const Node& node) const { return textAt(node.keyBegin, node.keySize); }
  // The value of a text node; empty for other nodes.
  std::string_view textOf(const Node& node) const { return textAt(node.textBegin, node.textSize); }
  // The object's field with this key, or null. If several fields have the key, the last one counts.
  const Node* field(const Node& object, std::string_view key) const;

  // Iterates over the elements of an array or object in order:
  //   for (const Node* one = first(array); one != end(array); one = next(*one))
  static const Node* first(const Node& node) { return &node + 1; }
  static const Node* next(const Node& node) { return &node + node.span; }
  static const Node* end(const Node& node) { return next(node); }

 private:
  class Builder;

  std::string_view textAt(std::uint32_t begin, std::uint32_t size) const {
    return std::string_view(text_).substr(begin, size);
  }

  std::vector<Node> nodes_;
  std::string text_;  // keys and texts, without escapes
};

}  // namespace tonewerk
