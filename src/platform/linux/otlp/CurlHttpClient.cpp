// SPDX-License-Identifier: Apache-2.0
#include "platform/linux/otlp/CurlHttpClient.h"

#include <cstdint>
#include <string_view>
#include <strings.h>
#include <utility>

#include "platform/linux/otlp/CurlLibrary.h"

namespace tonewerk {
namespace {

constexpr std::size_t kMaxHeaderBytes = std::size_t{64} << 10;
constexpr std::string_view kRetryAfter = "retry-after:";
constexpr int kPollMilliseconds = 1000;

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
  HeaderList(const CurlLibrary& curl, const std::vector<std::string>& headers) : curl_(curl) {
    for (const std::string& header : headers) append(header.c_str());
    append("Expect:");  // send the body without waiting for "100 Continue"
  }
  HeaderList(const HeaderList&) = delete;
  HeaderList& operator=(const HeaderList&) = delete;
  ~HeaderList() { curl_.slistFreeAll(list_); }
  curl_slist* get() const { return list_; }

 private:
  void append(const char* header) {
    if (curl_slist* longer = curl_.slistAppend(list_, header)) list_ = longer;
  }
  const CurlLibrary& curl_;
  curl_slist* list_ = nullptr;
};

using Url = std::unique_ptr<CURLU, decltype(&curl_url_cleanup)>;

std::string partOf(const CurlLibrary& curl, CURLU* url, CURLUPart part) {
  char* text = nullptr;
  if (curl.urlGet(url, part, &text, 0) != CURLUE_OK) return {};
  std::string copy = text;
  curl.free(text);
  return copy;
}

}  // namespace

struct CurlHttpClient::Handles {
  Handles() = default;
  Handles(const Handles&) = delete;
  Handles& operator=(const Handles&) = delete;
  ~Handles() {
    if (easy != nullptr) curl->easyCleanup(easy);
    if (multi != nullptr) curl->multiCleanup(multi);
  }

  // Makes what is not there yet. Returns false and sets `problem` when that is not possible now.
  [[nodiscard]] bool prepare(std::string& problem) {
    if (curl == nullptr) curl = CurlLibrary::get(problem);
    if (curl == nullptr) return false;
    if (easy == nullptr) easy = curl->easyInit();
    if (multi == nullptr) multi = curl->multiInit();
    if (easy != nullptr && multi != nullptr) return true;
    problem = "out of memory";
    return false;
  }

  // Any thread.
  void wake() {
    if (CURLM* const made = multi) curl->multiWakeup(made);
  }

  // Returns when the transfer has ended or was cancelled.
  CURLcode run(const std::atomic<bool>& isCancelled) const {
    if (curl->multiAddHandle(multi, easy) != CURLM_OK) return CURLE_FAILED_INIT;
    CURLcode result = CURLE_ABORTED_BY_CALLBACK;
    int running = 1;
    while (!isCancelled) {
      if (curl->multiPerform(multi, &running) != CURLM_OK) break;
      int left = 0;
      if (const CURLMsg* message = curl->multiInfoRead(multi, &left)) {
        result = message->data.result;
        break;
      }
      if (curl->multiPoll(multi, nullptr, 0, kPollMilliseconds, nullptr) != CURLM_OK) break;
    }
    curl->multiRemoveHandle(multi, easy);
    return result;
  }

  const CurlLibrary* curl = nullptr;
  CURL* easy = nullptr;
  std::atomic<CURLM*> multi = nullptr;  // the last to be made, so that wake() finds the library
};

CurlHttpClient::CurlHttpClient(std::string userAgent) : CurlHttpClient(std::move(userAgent), Timeouts()) {}

CurlHttpClient::CurlHttpClient(std::string userAgent, const Timeouts& timeouts)
    : userAgent_(std::move(userAgent)), timeouts_(timeouts), handles_(std::make_unique<Handles>()) {}

CurlHttpClient::~CurlHttpClient() = default;

HttpAnswer CurlHttpClient::post(const HttpRequest& request) {
  HttpAnswer answer;
  if (!handles_->prepare(answer.problem)) return answer;
  const CurlLibrary* const curl = handles_->curl;
  CURL* const easy = handles_->easy;
  const HeaderList headers(*curl, request.headers);
  Receiver receiver{answer};
  curl->easyReset(easy);
  curl->easySetopt(easy, CURLOPT_URL, request.url.c_str());
  curl->easySetopt(easy, CURLOPT_PROTOCOLS_STR, "http,https");
  curl->easySetopt(easy, CURLOPT_FOLLOWLOCATION, 0L);
  curl->easySetopt(easy, CURLOPT_NOSIGNAL, 1L);
  curl->easySetopt(easy, CURLOPT_QUICK_EXIT, 1L);  // do not wait for a name server at the end
  curl->easySetopt(easy, CURLOPT_CONNECTTIMEOUT_MS, static_cast<long>(timeouts_.connect.count()));
  curl->easySetopt(easy, CURLOPT_TIMEOUT_MS, static_cast<long>(timeouts_.whole.count()));
  curl->easySetopt(easy, CURLOPT_USERAGENT, userAgent_.c_str());
  curl->easySetopt(easy, CURLOPT_HTTPHEADER, headers.get());
  curl->easySetopt(easy, CURLOPT_POST, 1L);
  curl->easySetopt(easy, CURLOPT_POSTFIELDS, request.body.data());
  curl->easySetopt(easy, CURLOPT_POSTFIELDSIZE_LARGE, static_cast<curl_off_t>(request.body.size()));
  curl->easySetopt(easy, CURLOPT_HEADERFUNCTION, &takeHeader);
  curl->easySetopt(easy, CURLOPT_HEADERDATA, &receiver);
  curl->easySetopt(easy, CURLOPT_WRITEFUNCTION, &takeBody);
  curl->easySetopt(easy, CURLOPT_WRITEDATA, &receiver);

  const CURLcode result = handles_->run(isCancelled_);
  long status = 0;
  curl->easyGetinfo(easy, CURLINFO_RESPONSE_CODE, &status);
  // A status below 200 is not the final one.
  answer.status = status < 200 ? 0 : static_cast<int>(status);
  if (result != CURLE_OK) answer.problem = curl->easyStrerror(result);
  return answer;
}

void CurlHttpClient::cancel() {
  isCancelled_ = true;
  handles_->wake();
}

OtlpLogsAddress otlpLogsAddressOf(const std::string& base) {
  std::string unavailable;
  const CurlLibrary* curl = CurlLibrary::get(unavailable);
  if (curl == nullptr) return {.problem = unavailable, .isChecked = false};
  const Url url(curl->url(), curl->urlCleanup);
  const CURLUcode parsed = curl->urlSet(url.get(), CURLUPART_URL, base.c_str(), 0);
  if (parsed != CURLUE_OK) return {.problem = curl->urlStrerror(parsed)};
  const std::string scheme = partOf(*curl, url.get(), CURLUPART_SCHEME);
  if (scheme != "http" && scheme != "https") return {.problem = "it is neither http nor https"};
  for (const CURLUPart part : {CURLUPART_USER, CURLUPART_PASSWORD, CURLUPART_QUERY, CURLUPART_FRAGMENT}) {
    if (partOf(*curl, url.get(), part).empty()) continue;
    return {.problem = "it has a user, a query or a fragment"};
  }
  std::string address = partOf(*curl, url.get(), CURLUPART_URL);
  while (!address.empty() && address.back() == '/') address.pop_back();
  return {.url = address + "/v1/logs"};
}

}  // namespace tonewerk
