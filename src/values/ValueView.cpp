// SPDX-License-Identifier: Apache-2.0
#include "values/ValueView.h"

#include "values/Conversions.h"

namespace tonewerk {
namespace {

bool isEncodedText(EncodedValue value) { return value && value.isText(); }

}  // namespace

std::optional<std::string_view> ValueView::asText() const {
  if (value_ != nullptr) {
    const SharedString* text = value_->asString();
    return text == nullptr ? std::nullopt : std::optional(text->view());
  }
  return isEncodedText(encoded_) ? std::optional(encoded_.text()) : std::nullopt;
}

bool ValueView::boolean() const {
  if (value_ != nullptr || !encoded_) return booleanOf(value_);
  return encoded_.isText() ? booleanOfText(encoded_.text()) : encoded_.scalar().boolean();
}

std::int64_t ValueView::integer() const {
  if (value_ != nullptr || !encoded_) return integerOf(value_);
  return encoded_.isText() ? integerOfText(encoded_.text()) : encoded_.scalar().integer();
}

std::int32_t ValueView::integer32() const {
  if (value_ != nullptr || !encoded_) return integer32Of(value_);
  return encoded_.isText() ? static_cast<std::int32_t>(integerOfText(encoded_.text()))
                           : encoded_.scalar().integer32();
}

double ValueView::number() const {
  if (value_ != nullptr || !encoded_) return numberOf(value_);
  if (encoded_.isNumber()) {
    return encoding::visitNumber(encoded_.begin(), [](auto number) { return static_cast<double>(number); });
  }
  return encoded_.isText() ? numberOfText(encoded_.text()) : encoded_.scalar().number();
}

std::string ValueView::text() const {
  if (value_ != nullptr) return value_->text();
  if (!encoded_) return {};
  return encoded_.isText() ? std::string(encoded_.text()) : encoded_.value().text();
}

bool operator==(ValueView a, ValueView b) {
  if (a.encoded_ && b.encoded_) return a.encoded_ == b.encoded_;
  if (a.value_ != nullptr && b.value_ != nullptr) return *a.value_ == *b.value_;
  if (!a || !b) return !a && !b;
  const std::optional<std::string_view> text = a.asText();
  if (text) return text == b.asText();
  return a.value() == b.value();
}

}  // namespace tonewerk
