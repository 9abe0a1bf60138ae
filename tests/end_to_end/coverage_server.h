// The development coverage server as a process, told what to do and asked what it saw over its control address.
#pragma once

#include "end_to_end/programs.h"

namespace vrx::end_to_end {

class CoverageServer {
public:
    // Comes back once it serves.
    CoverageServer(const std::string& folder, const Arguments& arguments);

    const std::string& url() const { return url_; }
    Value ask(const std::string& method, const std::string& path, const std::string& body = "") const;
    // The requests since they were last forgotten, in order, such as "s200 c1:401 t200 c2:200": for the server-version
    // document (with a ! when past caches), for coverage with the token of a renewal, for a token; and "p200 c200" for
    // the store's purchases and catalogue, without a token. Then the answers' status, 0 for none. Waits until the
    // server has done with so many.
    std::string requests(std::ptrdiff_t count) const;

private:
    std::string url_;
    int controlPort_ = 0;
    std::optional<Process> process_;
};

}  // namespace vrx::end_to_end
