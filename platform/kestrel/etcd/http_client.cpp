// SPDX-License-Identifier: Apache-2.0
// Every option through which the environment, a server or a signal could change what happens is
// set.
#include "kestrel/etcd/http_client.h"

#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <array>
#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <string_view>
#include <system_error>

#include "kestrel/errors.h"
#include "kestrel/etcd/signal_guard.h"

namespace Kestrel::Etcd {

namespace {

constexpr const char *kWhere = "etcd";

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

// libcurl reads SSLKEYLOGFILE when it is initialised, and would write the secrets of all later TLS
// sessions of the process into that file.
CURLcode startWithoutKeyLog() {
  constexpr const char *kVariable = "SSLKEYLOGFILE";
  const char *value = getenv(kVariable);
  if (value == nullptr) return curl_global_init(CURL_GLOBAL_DEFAULT);
  const std::string kept = value;
  unsetenv(kVariable);
  const CURLcode result = curl_global_init(CURL_GLOBAL_DEFAULT);
  setenv(kVariable, kept.c_str(), 1);
  return result;
}

void startLibrary() {
  static const CURLcode result = startWithoutKeyLog();
  if (result != CURLE_OK) throw storeError(kWhere, "libcurl", curl_easy_strerror(result));
}

// To libcurl 0 means no limit.
long atLeastOne(std::chrono::milliseconds time) {
  return static_cast<long>(std::max<int64_t>(time.count(), 1));
}

template <typename Value>
void set(CURL *handle, CURLoption option, Value value) {
  const CURLcode result = curl_easy_setopt(handle, option, value);
  if (result != CURLE_OK) throw storeError(kWhere, "libcurl", curl_easy_strerror(result));
}

void check(CURLMcode result) {
  if (result != CURLM_OK) throw storeError(kWhere, "libcurl", curl_multi_strerror(result));
}

// libcurl reports an unreadable file only as unusable.
void checkFile(const char *key, const std::string &path) {
  if (path.empty() || access(path.c_str(), R_OK) == 0) return;
  throw storeError(path, std::string("the file of \"") + key + "\"",
                   std::generic_category().message(errno));
}

// A group of its own may read a key (as Debian's ssl-cert does); other users may not.
void checkKeyMode(const std::string &path) {
  struct stat info {};
  if (path.empty() || stat(path.c_str(), &info) != 0) return;
  if ((info.st_mode & (S_IWGRP | S_IRWXO)) == 0) return;
  throw storeError(path, "the file of \"key\"",
                   "other users have access (chmod 600, or 640 for a group that may read it)");
}

void setTls(CURL *handle, const std::string &cacert, const std::string &cert,
            const std::string &key) {
  set(handle, CURLOPT_SSL_VERIFYPEER, 1L);
  set(handle, CURLOPT_SSL_VERIFYHOST, 2L);
  set(handle, CURLOPT_SSLVERSION, static_cast<long>(CURL_SSLVERSION_TLSv1_2));
  if (!cacert.empty()) {
    set(handle, CURLOPT_CAINFO, cacert.c_str());
    // A fleet that names its own authority trusts no other.
    set(handle, CURLOPT_CAPATH, static_cast<const char *>(nullptr));
  }
  if (!cert.empty()) set(handle, CURLOPT_SSLCERT, cert.c_str());
  if (!key.empty()) set(handle, CURLOPT_SSLKEY, key.c_str());
}

void setBehaviour(CURL *handle) {
  set(handle, CURLOPT_NOSIGNAL, 1L);
  set(handle, CURLOPT_PROXY, "");
  set(handle, CURLOPT_FOLLOWLOCATION, 0L);
#if LIBCURL_VERSION_NUM >= 0x075500
  set(handle, CURLOPT_PROTOCOLS_STR, "http,https");
#else
  set(handle, CURLOPT_PROTOCOLS, static_cast<long>(CURLPROTO_HTTP | CURLPROTO_HTTPS));
#endif
#if LIBCURL_VERSION_NUM >= 0x075700
  // A name server that never responds must not hold up the end of the program.
  set(handle, CURLOPT_QUICK_EXIT, 1L);
#endif
  // Over HTTP/2 etcd expects gRPC, not JSON.
  set(handle, CURLOPT_HTTP_VERSION, static_cast<long>(CURL_HTTP_VERSION_1_1));
  set(handle, CURLOPT_WRITEFUNCTION, &take);
}

struct ListDeleter {
  void operator()(curl_slist *list) const { curl_slist_free_all(list); }
};
using HeaderList = std::unique_ptr<curl_slist, ListDeleter>;

HeaderList headers(const std::string &token) {
  HeaderList list;
  const auto append = [&list](const std::string &line) {
    curl_slist *longer = curl_slist_append(list.get(), line.c_str());
    if (longer == nullptr) throw storeError(kWhere, "libcurl", "out of memory");
    (void)list.release();  // LONGER is the same list with one more line
    list.reset(longer);
  };
  append("Content-Type: application/json");
  append("Expect:");  // without it a large request waits a round trip for "100 Continue"
  if (!token.empty()) append("Authorization: " + token);
  return list;
}

// Whether the two sides refused each other, rather than failed to reach each other. A server that
// refuses a client's certificate closes the connection after the client's part of the handshake,
// with a TLS alert that the client may or may not see: a CLOSED connection counts, too.
bool isUntrusted(CURLcode result, std::string_view text, bool closed) {
  switch (result) {
    case CURLE_PEER_FAILED_VERIFICATION:
    case CURLE_SSL_CERTPROBLEM:
    case CURLE_SSL_CIPHER:
    case CURLE_SSL_CACERT_BADFILE:
    case CURLE_SSL_CRL_BADFILE:
    case CURLE_SSL_ISSUER_ERROR:
      return true;
    case CURLE_SSL_CONNECT_ERROR:
      return text.find("alert") != text.npos;
    case CURLE_GOT_NOTHING:
    case CURLE_SEND_ERROR:
    case CURLE_RECV_ERROR:
      return closed || text.find("alert") != text.npos;
    default:
      return false;
  }
}

}  // namespace

// One request and all that libcurl refers to while it is under way.
struct HttpClient::Exchange {
  struct HandleDeleter {
    void operator()(CURL *easy) const { curl_easy_cleanup(easy); }
  };

  Exchange(CURLM *multiHandle, Id number, HttpRequest what)
      : id(number),
        request(std::move(what)),
        sink{{}, request.maxBytes},
        headers(Etcd::headers(request.token)),
        handle(curl_easy_init()),
        multi(multiHandle) {
    if (!handle) throw storeError(kWhere, "libcurl", "out of memory");
  }
  Exchange(const Exchange &) = delete;
  Exchange &operator=(const Exchange &) = delete;
  ~Exchange() {
    (void)curl_multi_remove_handle(multi, handle.get());
    explicit_bzero(request.json.data(), request.json.size());  // it may hold a password
  }

  void send() {
    CURL *easy = handle.get();
    set(easy, CURLOPT_URL, request.url.c_str());
    set(easy, CURLOPT_HTTPHEADER, headers.get());
    set(easy, CURLOPT_POSTFIELDS, request.json.c_str());
    set(easy, CURLOPT_POSTFIELDSIZE_LARGE, static_cast<curl_off_t>(request.json.size()));
    set(easy, CURLOPT_CONNECTTIMEOUT_MS, atLeastOne(request.connect));
    set(easy, CURLOPT_TIMEOUT_MS, atLeastOne(request.whole));
    set(easy, CURLOPT_FRESH_CONNECT, request.once ? 1L : 0L);
    set(easy, CURLOPT_FORBID_REUSE, request.once ? 1L : 0L);
    set(easy, CURLOPT_ERRORBUFFER, errorText.data());
    set(easy, CURLOPT_WRITEDATA, static_cast<void *>(&sink));
    check(curl_multi_add_handle(multi, easy));
  }

  bool handshakeDone() const {
    curl_off_t microseconds = 0;
    curl_easy_getinfo(handle.get(), CURLINFO_APPCONNECT_TIME_T, &microseconds);
    return microseconds != 0;
  }

  HttpResponse response(CURLcode result) {
    HttpResponse response;
    long sent = 0;
    curl_easy_getinfo(handle.get(), CURLINFO_REQUEST_SIZE, &sent);
    response.sent = sent != 0;
    if (result == CURLE_OK) {
      response.end = HttpResponse::End::kCompleted;
      curl_easy_getinfo(handle.get(), CURLINFO_RESPONSE_CODE, &response.status);
      response.body = std::move(sink.body);
      return response;
    }
    response.problem = sink.tooLarge          ? "the response is too large"
                       : errorText[0] != '\0' ? errorText.data()
                                              : curl_easy_strerror(result);
    if (sink.tooLarge) {
      response.end = HttpResponse::End::kTooLarge;
    } else if (isUntrusted(result, response.problem, withCertificate && handshakeDone())) {
      response.end = HttpResponse::End::kUntrusted;
    }
    return response;
  }

  const Id id;
  bool withCertificate = false;  // the client presents one
  HttpRequest request;
  Sink sink;
  std::array<char, CURL_ERROR_SIZE> errorText{};
  HeaderList headers;
  // It refers to all of the above, and is released before them.
  std::unique_ptr<CURL, HandleDeleter> handle;
  CURLM *multi;
};

HttpClient::HttpClient(const Configuration &configuration)
    : cacert_(configuration.cacert), cert_(configuration.cert), key_(configuration.key) {
  startLibrary();
  checkFile("cacert", cacert_);
  checkFile("cert", cert_);
  checkFile("key", key_);
  checkKeyMode(key_);
  multi_.reset(curl_multi_init());
  if (!multi_) throw storeError(kWhere, "libcurl", "out of memory");
}

// Closing a TLS connection writes to it.
HttpClient::~HttpClient() {
  const SignalGuard guard;
  exchanges_.clear();
  multi_.reset();
}

HttpClient::Id HttpClient::start(HttpRequest request) {
  const SignalGuard guard;
  auto exchange = std::make_unique<Exchange>(multi_.get(), nextId_++, std::move(request));
  setBehaviour(exchange->handle.get());
  setTls(exchange->handle.get(), cacert_, cert_, key_);
  exchange->withCertificate = !cert_.empty() && exchange->request.url.compare(0, 6, "https:") == 0;
  exchange->send();
  exchanges_.push_back(std::move(exchange));
  return exchanges_.back()->id;
}

std::optional<HttpClient::Finished> HttpClient::wait(const Deadline &until) {
  const SignalGuard guard;
  for (;;) {
    int running = 0;
    check(curl_multi_perform(multi_.get(), &running));
    if (auto finished = takeFinished()) return finished;
    if (exchanges_.empty() || until.passed()) return std::nullopt;
    const auto left = static_cast<int>(std::min<int64_t>(until.left().count(), 60000));
    check(curl_multi_poll(multi_.get(), nullptr, 0, left, nullptr));
  }
}

std::optional<HttpClient::Finished> HttpClient::takeFinished() {
  int left = 0;
  while (const CURLMsg *message = curl_multi_info_read(multi_.get(), &left)) {
    if (message->msg != CURLMSG_DONE) continue;
    for (auto exchange = exchanges_.begin(); exchange != exchanges_.end(); ++exchange) {
      if ((*exchange)->handle.get() != message->easy_handle) continue;
      Finished finished{(*exchange)->id, (*exchange)->response(message->data.result)};
      exchanges_.erase(exchange);
      return finished;
    }
  }
  return std::nullopt;
}

void HttpClient::cancelAll() {
  const SignalGuard guard;
  exchanges_.clear();
}

HttpResponse HttpClient::post(HttpRequest request) {
  // libcurl ends the request by its own time limit; this one only ends the wait.
  const Deadline deadline(request.whole + std::chrono::seconds(1));
  const Id id = start(std::move(request));
  auto finished = wait(deadline);
  if (finished && finished->id == id) return std::move(finished->response);
  cancelAll();
  HttpResponse response;
  response.sent = true;
  response.problem = "Operation timed out";
  return response;
}

}  // namespace Kestrel::Etcd
