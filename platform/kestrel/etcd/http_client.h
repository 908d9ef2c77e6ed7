// SPDX-License-Identifier: Apache-2.0
// HTTP requests, several at the same time, with one kept connection for each server: how libcurl is
// used, and nothing of etcd. The environment is not consulted, redirects are not followed,
// certificates are verified.
#pragma once

#include <curl/curl.h>

#include <chrono>
#include <cstddef>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "kestrel/configuration.h"
#include "kestrel/etcd/deadline.h"

namespace Kestrel::Etcd {

struct HttpRequest {
  std::string url;
  std::string json;   // the body
  std::string token;  // for the Authorization header; empty: none
  // The longest time until there is a connection, and in all.
  std::chrono::milliseconds connect{0}, whole{0};
  size_t maxBytes = 0;  // the largest body that is accepted

  // Sends the request on a new connection and then closes it. On a kept connection libcurl sends a
  // request a second time when the connection breaks before the first byte of the response, which
  // would make a change twice.
  bool once = false;
};

struct HttpResponse {
  enum class End {
    kCompleted,  // status and body are valid
    kFailed,     // no connection, or no whole response in time
    kTooLarge,   // the body is larger than the request accepts
    kUntrusted,  // one side does not accept the other's certificate, or its own is unusable
  };

  End end = End::kFailed;
  long status = 0;
  std::string body;
  bool sent = false;    // the server may have received the request, and acted on it
  std::string problem;  // why the response is missing, in words
};

// One thread at a time.
class HttpClient {
 public:
  using Id = size_t;

  struct Finished {
    Id id;
    HttpResponse response;
  };

  // Throws a ConfigStoreException when a file of the TLS settings cannot be used, or when libcurl
  // cannot be used.
  explicit HttpClient(const Configuration &configuration);
  HttpClient(const HttpClient &) = delete;
  HttpClient &operator=(const HttpClient &) = delete;
  ~HttpClient();

  // Begins to send a request, and returns without waiting.
  Id start(HttpRequest request);

  // Waits for the next request to end. Empty: the deadline passed, or no request is under way.
  std::optional<Finished> wait(const Deadline &until);

  // Gives up all requests that are under way and closes their connections.
  void cancelAll();

  // Sends one request and waits for its end. No other request may be under way.
  HttpResponse post(HttpRequest request);

 private:
  struct Exchange;
  struct MultiDeleter {
    void operator()(CURLM *handle) const { curl_multi_cleanup(handle); }
  };

  std::optional<Finished> takeFinished();

  std::string cacert_, cert_, key_;
  // The exchanges leave the multi handle before it goes: they are declared after it.
  std::unique_ptr<CURLM, MultiDeleter> multi_;
  std::vector<std::unique_ptr<Exchange>> exchanges_;
  Id nextId_ = 1;
};

}  // namespace Kestrel::Etcd
