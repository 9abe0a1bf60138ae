// The server-version document and the caching of its answers. The property lists are written here, not by the agent's
// codec, because they are to test that codec's reader.
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

// A property list whose root is an array, XML or binary as the document is.
std::string arrayLike(const std::string& document);

struct ServerVersionSettings {
    std::string lowVersion = "2";  // "none" leaves the key out
    std::string highVersion = "3";
    bool versionsAsStrings = false;  // a version that is not a number is always a string
    bool isBinary = false;
    std::string file;                                  // served unchanged in place of the document above
    std::string cacheControl = "public, max-age=300";  // empty for none
    bool etag = true;
    bool lastModified = true;
    bool conditional = true;  // answers 304 when the client has the current document
};

// Any thread may use it.
class ServerVersionDocument {
public:
    explicit ServerVersionDocument(ServerVersionSettings settings);
    void answer(const httplib::Request& request, httplib::Response& response) const;
    Json json() const;
    // Changes the given settings. Throws std::invalid_argument or a JSON error, and then changes none.
    void change(const Json& changes);

private:
    mutable std::mutex mutex_;
    ServerVersionSettings settings_;
    std::time_t changed_ = 0;
};

}  // namespace vrx::coverage_server
