// SPDX-License-Identifier: Apache-2.0
// Every option that could let the environment, a server or a signal change what happens is set.
#include "kestrel/etcd/http_client.h"

#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <system_error>

#include "kestrel/errors.h"
#include "kestrel/etcd/signal_guard.h"

namespace Kestrel::Etcd {

namespace {

struct Sink {
  std::string body;
  size_t maxBytes;
  bool tooLarge = false;
};

size_t take(char *data, size_t size, size_t count, void *target) {
  auto *sink = static_cast<Sink *>(target);
  const size_t bytes = size * count;
  if (bytes > sink->maxBytes - sink->body.size()) {
    sink->tooLarge = true;
    return 0;
  }
  try {
    sink->body.append(data, bytes);
  } catch (const std::bad_alloc &) {
    return 0;
  }
  return bytes;
}

void startLibrary() {
  static const CURLcode result = curl_global_init(CURL_GLOBAL_DEFAULT);
  if (result != CURLE_OK) throw storeError("etcd", "libcurl", curl_easy_strerror(result));
}

// 0 would mean for ever.
long atLeastOne(std::chrono::milliseconds time) {
  return static_cast<long>(std::max<int64_t>(time.count(), 1));
}

template <typename Value>
void set(CURL *handle, CURLoption option, Value value) {
  const CURLcode result = curl_easy_setopt(handle, option, value);
  if (result != CURLE_OK) throw storeError("etcd", "libcurl", curl_easy_strerror(result));
}

// libcurl would say of an unreadable file only that it is no good.
void setFile(CURL *handle, CURLoption option, const char *key, const std::string &path) {
  if (path.empty()) return;
  if (access(path.c_str(), R_OK) != 0) {
    throw storeError(path, std::string("the file of \"") + key + "\"",
                     std::generic_category().message(errno));
  }
  set(handle, option, path.c_str());
}

}  // namespace

HttpClient::HttpClient(const Configuration &configuration) {
  startLibrary();
  handle_.reset(curl_easy_init());
  if (!handle_) throw storeError("etcd", "libcurl", "out of memory");
  configure();
  configureTls(configuration);
  setHeaders("");
}

void HttpClient::configure() {
  CURL *handle = handle_.get();
  set(handle, CURLOPT_NOSIGNAL, 1L);
  set(handle, CURLOPT_PROXY, "");
  set(handle, CURLOPT_FOLLOWLOCATION, 0L);
#if LIBCURL_VERSION_NUM >= 0x075500
  set(handle, CURLOPT_PROTOCOLS_STR, "http,https");
#else
  set(handle, CURLOPT_PROTOCOLS, static_cast<long>(CURLPROTO_HTTP | CURLPROTO_HTTPS));
#endif
#if LIBCURL_VERSION_NUM >= 0x075700
  // A name server that never answers must not hold up the end of the program.
  set(handle, CURLOPT_QUICK_EXIT, 1L);
#endif
  // Over HTTP/2 etcd speaks to programs that know its own protocol.
  set(handle, CURLOPT_HTTP_VERSION, static_cast<long>(CURL_HTTP_VERSION_1_1));
  set(handle, CURLOPT_ERRORBUFFER, errorText_.data());
  set(handle, CURLOPT_WRITEFUNCTION, &take);
}

void HttpClient::configureTls(const Configuration &configuration) {
  CURL *handle = handle_.get();
  set(handle, CURLOPT_SSL_VERIFYPEER, 1L);
  set(handle, CURLOPT_SSL_VERIFYHOST, 2L);
  set(handle, CURLOPT_SSLVERSION, static_cast<long>(CURL_SSLVERSION_TLSv1_2));
  setFile(handle, CURLOPT_CAINFO, "cacert", configuration.cacert);
  // Who names an authority of the fleet's own trusts no other.
  if (!configuration.cacert.empty()) {
    set(handle, CURLOPT_CAPATH, static_cast<const char *>(nullptr));
  }
  setFile(handle, CURLOPT_SSLCERT, "cert", configuration.cert);
  setFile(handle, CURLOPT_SSLKEY, "key", configuration.key);
}

void HttpClient::setHeaders(const std::string &token) {
  std::unique_ptr<curl_slist, ListDeleter> list;
  const auto append = [&list](const std::string &line) {
    curl_slist *longer = curl_slist_append(list.get(), line.c_str());
    if (longer == nullptr) throw storeError("etcd", "libcurl", "out of memory");
    (void)list.release();  // the same list, with one line more
    list.reset(longer);
  };
  append("Content-Type: application/json");
  append("Expect:");  // a large request is not announced first: that would cost a round trip
  if (!token.empty()) append("Authorization: " + token);
  set(handle_.get(), CURLOPT_HTTPHEADER, list.get());
  headers_ = std::move(list);
  token_ = token;
}

HttpResponse HttpClient::post(const std::string &url, const std::string &json,
                              const std::string &token, TimeLimits limits, size_t maxBytes) {
  CURL *handle = handle_.get();
  if (token != token_) setHeaders(token);
  Sink sink{{}, maxBytes};
  set(handle, CURLOPT_URL, url.c_str());
  set(handle, CURLOPT_POSTFIELDS, json.c_str());
  set(handle, CURLOPT_POSTFIELDSIZE_LARGE, static_cast<curl_off_t>(json.size()));
  set(handle, CURLOPT_CONNECTTIMEOUT_MS, atLeastOne(limits.connect));
  set(handle, CURLOPT_TIMEOUT_MS, atLeastOne(limits.whole));
  set(handle, CURLOPT_WRITEDATA, static_cast<void *>(&sink));
  errorText_[0] = '\0';

  const SignalGuard guard;
  const CURLcode result = curl_easy_perform(handle);
  HttpResponse response = interpret(result, sink.tooLarge);
  if (response.end == HttpResponse::End::kCompleted) response.body = std::move(sink.body);
  return response;
}

HttpResponse HttpClient::interpret(CURLcode result, bool tooLarge) const {
  HttpResponse response;
  if (result == CURLE_OK) {
    response.end = HttpResponse::End::kCompleted;
    curl_easy_getinfo(handle_.get(), CURLINFO_RESPONSE_CODE, &response.status);
    return response;
  }
  long sent = 0;
  curl_easy_getinfo(handle_.get(), CURLINFO_REQUEST_SIZE, &sent);
  response.end = tooLarge    ? HttpResponse::End::kTooLarge
                 : sent == 0 ? HttpResponse::End::kNotReached
                             : HttpResponse::End::kNoResponse;
  response.problem = tooLarge                ? "the answer is too large"
                     : errorText_[0] != '\0' ? errorText_.data()
                                             : curl_easy_strerror(result);
  return response;
}

}  // namespace Kestrel::Etcd
