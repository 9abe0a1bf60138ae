// libcurl, opened when the first request is sent: with the libraries that it depends on it would be most of a small
// process.
#pragma once

#include <curl/curl.h>

#include <string>

#include "vrx/codec/core/lazy_library.h"

namespace vrx::host {

// libcurl's functions by their names there. Any thread may call them while problem is empty.
class Curl {
    codec::LazyLibrary library_{"libcurl.so.4"};

public:
    decltype(&::curl_global_init) globalInit = library_.function("curl_global_init");
    decltype(&::curl_free) free = library_.function("curl_free");
    decltype(&::curl_slist_append) slistAppend = library_.function("curl_slist_append");
    decltype(&::curl_slist_free_all) slistFreeAll = library_.function("curl_slist_free_all");
    decltype(&::curl_url) url = library_.function("curl_url");
    decltype(&::curl_url_cleanup) urlCleanup = library_.function("curl_url_cleanup");
    decltype(&::curl_url_set) urlSet = library_.function("curl_url_set");
    decltype(&::curl_url_get) urlGet = library_.function("curl_url_get");
    decltype(&::curl_easy_init) easyInit = library_.function("curl_easy_init");
    decltype(&::curl_easy_cleanup) easyCleanup = library_.function("curl_easy_cleanup");
    decltype(&::curl_easy_reset) easyReset = library_.function("curl_easy_reset");
    decltype(&::curl_easy_setopt) easySetopt = library_.function("curl_easy_setopt");
    decltype(&::curl_easy_getinfo) easyGetinfo = library_.function("curl_easy_getinfo");
    decltype(&::curl_easy_strerror) easyStrerror = library_.function("curl_easy_strerror");
    decltype(&::curl_multi_init) multiInit = library_.function("curl_multi_init");
    decltype(&::curl_multi_cleanup) multiCleanup = library_.function("curl_multi_cleanup");
    decltype(&::curl_multi_setopt) multiSetopt = library_.function("curl_multi_setopt");
    decltype(&::curl_multi_add_handle) multiAddHandle = library_.function("curl_multi_add_handle");
    decltype(&::curl_multi_remove_handle) multiRemoveHandle = library_.function("curl_multi_remove_handle");
    decltype(&::curl_multi_perform) multiPerform = library_.function("curl_multi_perform");
    decltype(&::curl_multi_poll) multiPoll = library_.function("curl_multi_poll");
    decltype(&::curl_multi_info_read) multiInfoRead = library_.function("curl_multi_info_read");

    // Why the functions must not be called. Empty when they may be.
    const std::string problem = begin();

private:
    std::string begin() const {
        if (std::string missing = library_.missing(); !missing.empty()) return missing;
        return globalInit(CURL_GLOBAL_DEFAULT) == CURLE_OK ? "" : "libcurl cannot begin";
    }
};

// The first call opens the library.
inline const Curl& curl() {
    static const Curl curl;
    return curl;
}

}  // namespace vrx::host
