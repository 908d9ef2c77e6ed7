// SPDX-License-Identifier: Apache-2.0
// HTTP requests over one kept connection for each server: what is asked of libcurl, and nothing of
// etcd. The environment is not consulted, redirects are not followed, certificates are verified.
#pragma once

#include <curl/curl.h>

#include <array>
#include <chrono>
#include <cstddef>
#include <memory>
#include <string>

#include "kestrel/configuration.h"

namespace Kestrel::Etcd {

struct HttpResponse {
  enum class End {
    kCompleted,   // status and body hold
    kNotReached,  // the server got nothing of the request
    kNoResponse,  // the server may have acted on the request
    kTooLarge,    // the body is larger than the caller takes
  };

  End end = End::kNotReached;
  long status = 0;
  std::string body;
  std::string problem;  // why there is no answer, in words
};

// How long an exchange may take: until there is a connection, and in all.
struct TimeLimits {
  std::chrono::milliseconds connect, whole;
};

// Not for two threads at once.
class HttpClient {
 public:
  // Throws a ConfigStoreException when a file of the TLS settings cannot be read, or when libcurl
  // cannot be used.
  explicit HttpClient(const Configuration &configuration);

  // Sends a JSON text and waits for the whole answer. token: for the Authorization header; empty:
  // none. maxBytes: the largest body that is taken.
  HttpResponse post(const std::string &url, const std::string &json, const std::string &token,
                    TimeLimits limits, size_t maxBytes);

 private:
  struct HandleDeleter {
    void operator()(CURL *handle) const { curl_easy_cleanup(handle); }
  };
  struct ListDeleter {
    void operator()(curl_slist *list) const { curl_slist_free_all(list); }
  };

  void configure();
  void configureTls(const Configuration &configuration);
  void setHeaders(const std::string &token);
  HttpResponse interpret(CURLcode result, bool tooLarge) const;

  std::array<char, CURL_ERROR_SIZE> errorText_{};
  std::string token_;
  // The handle refers to the headers and to the text: it goes first.
  std::unique_ptr<curl_slist, ListDeleter> headers_;
  std::unique_ptr<CURL, HandleDeleter> handle_;
};

}  // namespace Kestrel::Etcd
