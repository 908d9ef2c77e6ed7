/* SPDX-License-Identifier: Apache-2.0 */
/* The other side of the comparison: libcurl alone, in C, which reads the same values and checks
   only the status of the responses. With a COUNT it reads so many keys one by one over one
   connection; with "range" it reads all keys of the prefix in one request.

   usage: bare_curl URL COUNT|range */
#include <curl/curl.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>

static size_t discard(char *data, size_t size, size_t count, void *unused) {
  (void)data;
  (void)unused;
  return size * count;
}

static void encode(const char *text, char *out) {
  static const char kDigits[] = "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789+/";
  const size_t length = strlen(text);
  for (size_t at = 0; at < length; at += 3) {
    const unsigned a = (unsigned char)text[at];
    const unsigned b = at + 1 < length ? (unsigned char)text[at + 1] : 0;
    const unsigned c = at + 2 < length ? (unsigned char)text[at + 2] : 0;
    *out++ = kDigits[a >> 2];
    *out++ = kDigits[(a & 3) << 4 | b >> 4];
    *out++ = at + 1 < length ? kDigits[(b & 15) << 2 | c >> 6] : '=';
    *out++ = at + 2 < length ? kDigits[c & 63] : '=';
  }
  *out = '\0';
}

static int post(CURL *handle, const char *body) {
  curl_easy_setopt(handle, CURLOPT_POSTFIELDS, body);
  long status = 0;
  if (curl_easy_perform(handle) != CURLE_OK) return 0;
  curl_easy_getinfo(handle, CURLINFO_RESPONSE_CODE, &status);
  return status == 200;
}

static int lookUp(CURL *handle, int index) {
  char key[128], encoded[256], body[512];
  snprintf(key, sizeof key, "/kestrel/global/host/pools/p%d", index);
  encode(key, encoded);
  snprintf(body, sizeof body, "{\"key\":\"%s\",\"serializable\":true}", encoded);
  return post(handle, body);
}

static int range(CURL *handle) {
  char from[64], to[64], body[256];
  encode("/kestrel/global/", from);
  encode("/kestrel/global0", to);
  snprintf(body, sizeof body, "{\"key\":\"%s\",\"range_end\":\"%s\",\"limit\":\"10000\"}", from,
           to);
  return post(handle, body);
}

int main(int argc, char **argv) {
  if (argc != 3) return 2;
  char url[512];
  snprintf(url, sizeof url, "%s/v3/kv/range", argv[1]);
  CURL *handle = curl_easy_init();
  if (handle == NULL) return 1;
  struct curl_slist *headers = curl_slist_append(NULL, "Content-Type: application/json");
  curl_easy_setopt(handle, CURLOPT_URL, url);
  curl_easy_setopt(handle, CURLOPT_HTTPHEADER, headers);
  curl_easy_setopt(handle, CURLOPT_WRITEFUNCTION, discard);
  int failed = 0;
  if (strcmp(argv[2], "range") == 0) failed = !range(handle);
  for (int i = 0; i < atoi(argv[2]); ++i) failed |= !lookUp(handle, i);
  curl_easy_cleanup(handle);
  curl_slist_free_all(headers);
  return failed;
}
