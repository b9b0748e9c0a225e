// Thin move-only RAII wrappers around libcurl's easy interface, in the manner of MPD's
// src/lib/curl: an easy handle, a header list, and the process-wide global initialisation. No
// exceptions: every operation reports libcurl's own result code.
#pragma once

#include <curl/curl.h>

#include <utility>

namespace harmona::curl {

// curl_global_init for the lifetime of the object (libcurl reference-counts it).
class GlobalInit {
  public:
    GlobalInit() : code_(curl_global_init(CURL_GLOBAL_DEFAULT)) {}
    ~GlobalInit() {
        if (code_ == CURLE_OK)
            curl_global_cleanup();
    }
    GlobalInit(const GlobalInit&) = delete;
    GlobalInit& operator=(const GlobalInit&) = delete;

    explicit operator bool() const { return code_ == CURLE_OK; }

  private:
    CURLcode code_;
};

// A curl_slist, e.g. request headers.
class StringList {
  public:
    StringList() = default;
    ~StringList() { curl_slist_free_all(head_); }
    StringList(StringList&& other) noexcept : head_(std::exchange(other.head_, nullptr)) {}
    StringList& operator=(StringList&& other) noexcept {
        std::swap(head_, other.head_);
        return *this;
    }
    StringList(const StringList&) = delete;
    StringList& operator=(const StringList&) = delete;

    // Appends a copy of `text`; false when out of memory (the list is unchanged then).
    bool Append(const char* text);

    curl_slist* Get() const { return head_; }

  private:
    curl_slist* head_ = nullptr;
};

// A CURL easy handle.
class Easy {
  public:
    Easy() : handle_(curl_easy_init()) {}
    ~Easy() {
        if (handle_ != nullptr)
            curl_easy_cleanup(handle_);
    }
    Easy(Easy&& other) noexcept : handle_(std::exchange(other.handle_, nullptr)) {}
    Easy& operator=(Easy&& other) noexcept {
        std::swap(handle_, other.handle_);
        return *this;
    }
    Easy(const Easy&) = delete;
    Easy& operator=(const Easy&) = delete;

    explicit operator bool() const { return handle_ != nullptr; }
    CURL* Get() const { return handle_; }

    template <typename Value>
    CURLcode SetOption(CURLoption option, Value value) {
        return curl_easy_setopt(handle_, option, value);
    }

    CURLcode Perform() { return curl_easy_perform(handle_); }

    template <typename Value>
    CURLcode GetInfo(CURLINFO info, Value* value) const {
        return curl_easy_getinfo(handle_, info, value);
    }

    // The HTTP status of the last transfer, 0 when there was none.
    long ResponseCode() const;

  private:
    CURL* handle_;
};

}  // namespace harmona::curl
