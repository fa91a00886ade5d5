// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/json/JsonTree.h"

#include <nlohmann/json.hpp>
#include <utility>

namespace tonewerk {

// Receives the events of the library's SAX parser, which prescribes the names of the public functions.
class JsonTree::Builder {
 public:
  Builder(JsonTree& tree, std::string& message) : nodes_(tree.nodes_), text_(tree.text_), message_(message) {}

  Failure failure() const { return failure_; }

  bool null() { return add(Kind::kNull) != nullptr; }
  bool boolean(bool value) {
    add(Kind::kBoolean)->boolean = value;
    return true;
  }
  bool number_integer(std::int64_t value) {
    add(Kind::kInteger)->integer = value;
    return true;
  }
  bool number_unsigned(std::uint64_t value) {
    add(Kind::kUnsigned)->unsignedInteger = value;
    return true;
  }
  bool number_float(double value, const std::string&) {
    add(Kind::kDouble)->number = value;
    return true;
  }
  bool string(const std::string& value) {
    Node* node = add(Kind::kText);
    node->textBegin = static_cast<std::uint32_t>(text_.size());
    node->textSize = static_cast<std::uint32_t>(value.size());
    text_ += value;
    return true;
  }
  static bool binary(const std::vector<std::uint8_t>&) { return false; }  // JSON has no binary values
  bool start_object(std::size_t) { return begin(Kind::kObject); }
  bool start_array(std::size_t) { return begin(Kind::kArray); }
  bool end_object() { return end(); }
  bool end_array() { return end(); }
  bool key(const std::string& name) {
    keyBegin_ = static_cast<std::uint32_t>(text_.size());
    keySize_ = static_cast<std::uint32_t>(name.size());
    text_ += name;
    return true;
  }

  bool parse_error(std::size_t, const std::string&, const nlohmann::json::exception& error) {
    const bool isNotJson = dynamic_cast<const nlohmann::json::parse_error*>(&error) != nullptr;
    failure_ = isNotJson ? Failure::kNotJson : Failure::kNumberOutOfRange;
    message_ = error.what();
    return false;
  }

 private:
  Node* add(Kind kind) {
    if (!open_.empty()) ++nodes_[open_.back()].count;
    Node& node = nodes_.emplace_back();
    node.kind = kind;
    node.keyBegin = keyBegin_;
    node.keySize = std::exchange(keySize_, 0);
    return &node;
  }

  bool begin(Kind kind) {
    add(kind)->count = 0;
    open_.push_back(nodes_.size() - 1);
    return true;
  }

  bool end() {
    Node& node = nodes_[open_.back()];
    node.span = static_cast<std::uint32_t>(nodes_.size() - open_.back());
    open_.pop_back();
    return true;
  }

  std::vector<Node>& nodes_;
  std::string& text_;
  std::string& message_;
  std::vector<std::size_t> open_;  // indices of the arrays and objects that are not complete yet
  std::uint32_t keyBegin_ = 0;     // key of the field whose value comes next
  std::uint32_t keySize_ = 0;
  Failure failure_ = Failure::kNone;
};

JsonTree::Failure JsonTree::parse(std::string_view text, std::string& message) {
  nodes_.clear();
  text_.clear();
  Builder builder(*this, message);
  nlohmann::json::sax_parse(text, &builder);
  return builder.failure();
}

const JsonTree::Node* JsonTree::field(const Node& object, std::string_view key) const {
  const Node* found = nullptr;
  for (const Node* one = first(object); one != end(object); one = next(*one)) {
    if (keyOf(*one) == key) found = one;
  }
  return found;
}

}  // namespace tonewerk
