// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/otlp/CurlHttpClient.h"

#include <cstdint>
#include <curl/curl.h>
#include <string_view>
#include <strings.h>
#include <utility>

namespace tonewerk {
namespace {

constexpr std::size_t kMaxHeaderBytes = std::size_t{64} << 10;
constexpr std::string_view kRetryAfter = "retry-after:";
constexpr int kPollMilliseconds = 1000;

// libcurl must be initialised once in the process, before any other use.
bool startLibrary() {
  static const bool isStarted = curl_global_init(CURL_GLOBAL_DEFAULT) == CURLE_OK;
  return isStarted;
}

// Receives an answer up to its size limits.
struct Receiver {
  HttpAnswer& answer;
  std::size_t headerBytes = 0;
};

bool beginsWithName(std::string_view line, std::string_view name) {
  return line.size() >= name.size() && strncasecmp(line.data(), name.data(), name.size()) == 0;
}

// Returning fewer bytes than given ends the transfer.
std::size_t takeHeader(char* data, std::size_t size, std::size_t count, void* held) {
  auto& receiver = *static_cast<Receiver*>(held);
  const std::string_view line(data, size * count);
  receiver.headerBytes += line.size();
  if (receiver.headerBytes > kMaxHeaderBytes) return 0;
  if (beginsWithName(line, kRetryAfter)) receiver.answer.retryAfter = line.substr(kRetryAfter.size());
  return line.size();
}

std::size_t takeBody(char* data, std::size_t size, std::size_t count, void* held) {
  std::string& body = static_cast<Receiver*>(held)->answer.body;
  const std::size_t bytes = size * count;
  const std::size_t room = HttpAnswer::kMaxBodyBytes - body.size();
  if (bytes > room) {
    body.append(data, room);
    return 0;
  }
  body.append(data, bytes);
  return bytes;
}

class HeaderList {
 public:
  explicit HeaderList(const std::vector<std::string>& headers) {
    for (const std::string& header : headers) append(header.c_str());
    append("Expect:");  // send the body without waiting for "100 Continue"
  }
  HeaderList(const HeaderList&) = delete;
  HeaderList& operator=(const HeaderList&) = delete;
  ~HeaderList() { curl_slist_free_all(list_); }
  curl_slist* get() const { return list_; }

 private:
  void append(const char* header) {
    if (curl_slist* longer = curl_slist_append(list_, header)) list_ = longer;
  }
  curl_slist* list_ = nullptr;
};

struct UrlDeleter {
  void operator()(CURLU* url) const { curl_url_cleanup(url); }
};
using Url = std::unique_ptr<CURLU, UrlDeleter>;

std::string partOf(CURLU* url, CURLUPart part) {
  char* text = nullptr;
  if (curl_url_get(url, part, &text, 0) != CURLUE_OK) return {};
  std::string copy = text;
  curl_free(text);
  return copy;
}

}  // namespace

struct CurlHttpClient::Handles {
  Handles() : multi(startLibrary() ? curl_multi_init() : nullptr), easy(curl_easy_init()) {}
  Handles(const Handles&) = delete;
  Handles& operator=(const Handles&) = delete;
  ~Handles() {
    if (easy != nullptr) curl_easy_cleanup(easy);
    if (multi != nullptr) curl_multi_cleanup(multi);
  }

  // Returns when the transfer has ended or was cancelled.
  CURLcode run(const std::atomic<bool>& isCancelled) const {
    if (curl_multi_add_handle(multi, easy) != CURLM_OK) return CURLE_FAILED_INIT;
    CURLcode result = CURLE_ABORTED_BY_CALLBACK;
    int running = 1;
    while (!isCancelled) {
      if (curl_multi_perform(multi, &running) != CURLM_OK) break;
      int left = 0;
      if (const CURLMsg* message = curl_multi_info_read(multi, &left)) {
        result = message->data.result;
        break;
      }
      if (curl_multi_poll(multi, nullptr, 0, kPollMilliseconds, nullptr) != CURLM_OK) break;
    }
    curl_multi_remove_handle(multi, easy);
    return result;
  }

  CURLM* multi;
  CURL* easy;
};

CurlHttpClient::CurlHttpClient(std::string userAgent) : CurlHttpClient(std::move(userAgent), Timeouts()) {}

CurlHttpClient::CurlHttpClient(std::string userAgent, const Timeouts& timeouts)
    : userAgent_(std::move(userAgent)), timeouts_(timeouts), handles_(std::make_unique<Handles>()) {}

CurlHttpClient::~CurlHttpClient() = default;

HttpAnswer CurlHttpClient::post(const HttpRequest& request) {
  HttpAnswer answer;
  CURL* easy = handles_->easy;
  if (handles_->multi == nullptr || easy == nullptr) {
    answer.problem = "out of memory";
    return answer;
  }
  const HeaderList headers(request.headers);
  Receiver receiver{answer};
  curl_easy_reset(easy);
  curl_easy_setopt(easy, CURLOPT_URL, request.url.c_str());
  curl_easy_setopt(easy, CURLOPT_PROTOCOLS_STR, "http,https");
  curl_easy_setopt(easy, CURLOPT_FOLLOWLOCATION, 0L);
  curl_easy_setopt(easy, CURLOPT_NOSIGNAL, 1L);
  curl_easy_setopt(easy, CURLOPT_QUICK_EXIT, 1L);  // do not wait for a name server at the end
  curl_easy_setopt(easy, CURLOPT_CONNECTTIMEOUT_MS, static_cast<long>(timeouts_.connect.count()));
  curl_easy_setopt(easy, CURLOPT_TIMEOUT_MS, static_cast<long>(timeouts_.whole.count()));
  curl_easy_setopt(easy, CURLOPT_USERAGENT, userAgent_.c_str());
  curl_easy_setopt(easy, CURLOPT_HTTPHEADER, headers.get());
  curl_easy_setopt(easy, CURLOPT_POST, 1L);
  curl_easy_setopt(easy, CURLOPT_POSTFIELDS, request.body.data());
  curl_easy_setopt(easy, CURLOPT_POSTFIELDSIZE_LARGE, static_cast<curl_off_t>(request.body.size()));
  curl_easy_setopt(easy, CURLOPT_HEADERFUNCTION, &takeHeader);
  curl_easy_setopt(easy, CURLOPT_HEADERDATA, &receiver);
  curl_easy_setopt(easy, CURLOPT_WRITEFUNCTION, &takeBody);
  curl_easy_setopt(easy, CURLOPT_WRITEDATA, &receiver);

  const CURLcode result = handles_->run(isCancelled_);
  long status = 0;
  curl_easy_getinfo(easy, CURLINFO_RESPONSE_CODE, &status);
  // A status below 200 is not the final one.
  answer.status = status < 200 ? 0 : static_cast<int>(status);
  if (result != CURLE_OK) answer.problem = curl_easy_strerror(result);
  return answer;
}

void CurlHttpClient::cancel() {
  isCancelled_ = true;
  if (handles_->multi != nullptr) curl_multi_wakeup(handles_->multi);
}

std::string otlpLogsAddressOf(const std::string& base, std::string& problem) {
  const Url url(curl_url());
  const CURLUcode parsed = curl_url_set(url.get(), CURLUPART_URL, base.c_str(), 0);
  if (parsed != CURLUE_OK) {
    problem = curl_url_strerror(parsed);
    return {};
  }
  const std::string scheme = partOf(url.get(), CURLUPART_SCHEME);
  if (scheme != "http" && scheme != "https") {
    problem = "it is neither http nor https";
    return {};
  }
  for (const CURLUPart part : {CURLUPART_USER, CURLUPART_PASSWORD, CURLUPART_QUERY, CURLUPART_FRAGMENT}) {
    if (partOf(url.get(), part).empty()) continue;
    problem = "it has a user, a query or a fragment";
    return {};
  }
  std::string address = partOf(url.get(), CURLUPART_URL);
  while (!address.empty() && address.back() == '/') address.pop_back();
  return address + "/v1/logs";
}

}  // namespace tonewerk
