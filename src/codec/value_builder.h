// Builds a value from the events of a document that is read from front to back, within the limits of documents. A
// builder belongs to one thread.
#pragma once

#include <cstddef>
#include <string>
#include <vector>

#include "vrx/platform/value.h"

namespace vrx::codec {

class ValueBuilder {
public:
    // Whether a value or a container comes next: at the root, in an array, or after a key.
    bool expectsValue() const;
    // Whether a key or the end of the dictionary comes next.
    bool expectsKey() const;
    bool isInArray() const { return !open_.empty() && !open_.back().isDictionary; }
    bool isComplete() const { return count_ > 0 && open_.empty(); }

    // These return false when a limit is exceeded; complaint() says which.
    bool add(platform::Value&& value);
    bool beginArray() { return begin(false); }
    bool beginDictionary() { return begin(true); }
    const char* complaint() const { return complaint_; }

    // The key of the next value. Of values with the same key the last counts.
    void key(std::string key);
    void end();

    platform::Value takeRoot() { return std::move(root_); }

private:
    struct Container {
        bool isDictionary;
        platform::Array elements;
        platform::Dictionary entries;
        std::string key;
        bool hasKey = false;
    };

    bool begin(bool isDictionary);
    bool count();
    void place(platform::Value&& value);

    std::vector<Container> open_;
    platform::Value root_;
    std::size_t count_ = 0;
    const char* complaint_ = "";
};

}  // namespace vrx::codec
