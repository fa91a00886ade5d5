// SPDX-License-Identifier: Apache-2.0
#pragma once

#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

namespace tonewerk {

// A JSON text as a tree of values that lies in one piece of memory, in the order of the text: each value
// before what it holds. For texts that are read whole, often, and only once; a tree of maps costs twice as
// much.
class JsonTree {
 public:
  enum class Kind : std::uint8_t { kNull, kBoolean, kInteger, kUnsigned, kDouble, kText, kArray, kObject };
  enum class Failure { kNone, kNotJson, kNumberOutOfRange };  // the latter: beyond what a double can hold

  struct Node {
    union {
      bool boolean;
      std::int64_t integer;           // negative ones
      std::uint64_t unsignedInteger;  // all others that 64 bits can hold
      double number;                  // what has a fraction or an exponent, or is larger
      std::uint64_t count;            // of an array's or object's own values
    };
    std::uint32_t span = 1;  // nodes, with all that it holds
    Kind kind = Kind::kNull;
    // Places in the tree's text.
    std::uint32_t keyBegin = 0;
    std::uint32_t keySize = 0;
    std::uint32_t textBegin = 0;
    std::uint32_t textSize = 0;
  };

  // Below 4 GiB. When it fails, `words` say where and why, if the text is no JSON, and the tree is of no use.
  [[nodiscard]] Failure parse(std::string_view text, std::string& words);

  const Node& root() const { return nodes_.front(); }
  // Of a field of an object, otherwise empty.
  std::string_view keyOf(const Node& node) const { return textAt(node.keyBegin, node.keySize); }
  // Of a text, otherwise empty.
  std::string_view textOf(const Node& node) const { return textAt(node.textBegin, node.textSize); }
  // The object's field of that name, the last one if there are several; null without such.
  const Node* field(const Node& object, std::string_view key) const;

  // The values that an array or object holds, in order:
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
