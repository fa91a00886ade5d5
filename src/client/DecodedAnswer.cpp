// SPDX-License-Identifier: Apache-2.0
#include "client/DecodedAnswer.h"

#include "platform/linux/messagepack/RpcWriter.h"

namespace tonewerk {
namespace {

std::uint16_t serviceTypeOf(const Value* value) {
  const std::int64_t* number = value == nullptr ? nullptr : value->asInteger();
  const bool fits = number != nullptr && *number >= 0 && *number <= TWR_SERVICE_UNKNOWN;
  return fits ? static_cast<std::uint16_t>(*number) : TWR_SERVICE_UNKNOWN;
}

std::int64_t identifierOf(const Value* value) {
  const std::int64_t* number = value == nullptr ? nullptr : value->asInteger();
  return number == nullptr ? 0 : *number;
}

}  // namespace

DecodedAnswer::DecodedAnswer(twr_status status) {
  answer_.status = status;
  answer_.service_type = TWR_SERVICE_UNKNOWN;
}

DecodedAnswer::DecodedAnswer(const RpcFrame& response) : DecodedAnswer(TWR_OK) {
  if (response.error) {
    take(*response.error);
    return;
  }
  value_ = response.result;
  if (value_) RpcWriter(result_).value(*value_);
}

void DecodedAnswer::take(const Value& error) {
  answer_.status = TWR_REFUSED;
  if (const ValueMap* map = error.asMap()) {
    errorDomain_ = map->text("domain");
    answer_.error_code = map->integer("code");
    errorMessage_ = map->text("message");
  } else {
    errorMessage_ = error.text();
  }
}

const twr_answer& DecodedAnswer::as(AnswerKind kind) {
  answer_.error_domain = errorDomain_.c_str();
  answer_.error_message = errorMessage_.c_str();
  if (!result_.empty()) {
    answer_.result = result_.data();
    answer_.result_size = result_.size();
  }
  answer_.reporter_id = 0;
  answer_.service_type = TWR_SERVICE_UNKNOWN;
  answer_.reporter_ids = nullptr;
  answer_.reporter_id_count = 0;
  if (!value_) return answer_;

  if (kind == AnswerKind::kServiceType) answer_.service_type = serviceTypeOf(&*value_);
  const ValueMap* map = value_->asMap();
  if (kind == AnswerKind::kValidity && map != nullptr) {
    answer_.reporter_id = identifierOf(map->find("reporterID"));
    answer_.service_type = serviceTypeOf(map->find("serviceType"));
  }
  const ValueArray* array = value_->asArray();
  if (kind == AnswerKind::kReporters && array != nullptr) {
    reporterIDs_.clear();
    for (const Value& identifier : *array) reporterIDs_.push_back(identifierOf(&identifier));
    answer_.reporter_ids = reporterIDs_.data();
    answer_.reporter_id_count = reporterIDs_.size();
  }
  return answer_;
}

}  // namespace tonewerk
