// The server-version document and the caching of its answers. The property lists are written here and not by the
// agent's own codec, whose reader they are to try.
#pragma once

#include <httplib.h>

#include <ctime>
#include <mutex>
#include <string>
#include <string_view>

#include "coverage_server/json.h"

namespace vrx::coverage_server {

inline constexpr std::string_view xmlPropertyListBegin =
    "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n"
    "<!DOCTYPE plist PUBLIC \"-//Orvane//DTD PLIST 1.0//EN\" \"http://www.orvane.example/DTDs/PropertyList-1.0.dtd\">\n"
    "<plist version=\"1.0\">\n";

// A property list of the document's form, XML or binary, whose root is an array.
std::string arrayLike(const std::string& document);

struct ServerVersionSettings {
    std::string lowVersion = "2";  // "none" leaves the key out
    std::string highVersion = "3";
    bool versionsAsStrings = false;  // what is no number always is one
    bool isBinary = false;
    std::string file;                                  // served as it is, in place of a document made of the above
    std::string cacheControl = "public, max-age=300";  // empty for none
    bool etag = true;
    bool lastModified = true;
    bool conditional = true;  // a request for what has not changed is answered 304
};

// Any thread may use it.
class ServerVersionDocument {
public:
    explicit ServerVersionDocument(ServerVersionSettings settings);
    void answer(const httplib::Request& request, httplib::Response& response) const;
    Json json() const;
    // Changes the settings that are given. Throws std::invalid_argument or a JSON error, and then changes nothing.
    void change(const Json& changes);

private:
    mutable std::mutex mutex_;
    ServerVersionSettings settings_;
    std::time_t changed_ = 0;
};

}  // namespace vrx::coverage_server
