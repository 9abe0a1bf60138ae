#include "vrx/codec/value_builder.h"

#include "vrx/platform/limits.h"

namespace vrx::codec {

using platform::Value;

bool ValueBuilder::expectsValue() const {
    if (open_.empty()) return count_ == 0;
    return !open_.back().isDictionary || open_.back().hasKey;
}

bool ValueBuilder::expectsKey() const {
    return !open_.empty() && open_.back().isDictionary && !open_.back().hasKey;
}

bool ValueBuilder::add(Value&& value) {
    if (!count()) return false;
    place(std::move(value));
    return true;
}

bool ValueBuilder::begin(bool isDictionary) {
    if (open_.size() == static_cast<std::size_t>(platform::limits::documentDepth)) {
        complaint_ = "nested too deeply";
        return false;
    }
    if (!count()) return false;
    open_.push_back({.isDictionary = isDictionary, .elements = {}, .entries = {}, .key = {}});
    return true;
}

void ValueBuilder::key(std::string key) {
    open_.back().key = std::move(key);
    open_.back().hasKey = true;
}

void ValueBuilder::end() {
    Container closed = std::move(open_.back());
    open_.pop_back();
    if (closed.isDictionary)
        place(std::move(closed.entries));
    else
        place(std::move(closed.elements));
}

bool ValueBuilder::count() {
    if (count_ == platform::limits::documentValues) {
        complaint_ = "too many values";
        return false;
    }
    ++count_;
    return true;
}

void ValueBuilder::place(Value&& value) {
    if (open_.empty()) {
        root_ = std::move(value);
    } else if (Container& container = open_.back(); container.isDictionary) {
        container.entries.insert_or_assign(std::move(container.key), std::move(value));
        container.hasKey = false;
    } else {
        container.elements.push_back(std::move(value));
    }
}

}  // namespace vrx::codec
