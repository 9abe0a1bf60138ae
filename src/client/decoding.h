// Decodes each reply as the type that the operation returns and no other.
#pragma once

#include <memory>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "vrx/client/answer.h"
#include "vrx/codec/core/keyed_archive.h"
#include "vrx/platform/value.h"

namespace vrx::client {

inline Failure badReply(std::string text) {
    return {Failure::Kind::BadReply, std::move(text)};
}

template <class T>
struct Decoder;

template <>
struct Decoder<bool> {
    static Answer<bool> decode(const platform::Value& root) {
        if (auto flag = root.asBool()) return *flag;
        return badReply("the reply is no boolean");
    }
};

template <>
struct Decoder<std::optional<std::string>> {
    static Answer<std::optional<std::string>> decode(const platform::Value& root) {
        if (root.isNull()) return std::optional<std::string>();
        if (const std::string* text = root.asString()) return std::optional(*text);
        return badReply("the reply is no string");
    }
};

template <>
struct Decoder<platform::Value> {
    static Answer<platform::Value> decode(const platform::Value& root) {
        using enum platform::AllowedKinds::Kind;
        if (root.isNull()) return platform::Value();
        platform::Result<platform::Value> value =
            codec::unarchiveValue(root, {Dictionaries, Arrays, Strings, Numbers, Dates});
        if (!value) return badReply(value.error().text);
        if (!value->asDictionary()) return badReply("the reply is no dictionary");
        return std::move(value).value();
    }
};

template <class T>
struct Decoder<std::shared_ptr<T>> {
    static Answer<std::shared_ptr<T>> decode(const platform::Value& root) {
        if (root.isNull()) return std::shared_ptr<T>();
        platform::Result<std::shared_ptr<T>> object = codec::unarchive<T>(root);
        if (!object) return badReply(object.error().text);
        return std::move(object).value();
    }
};

template <class T>
struct Decoder<std::vector<std::shared_ptr<T>>> {
    static Answer<std::vector<std::shared_ptr<T>>> decode(const platform::Value& root) {
        platform::Result<std::vector<std::shared_ptr<T>>> objects = codec::unarchiveList<T>(root);
        if (!objects) return badReply(objects.error().text);
        return std::move(objects).value();
    }
};

}  // namespace vrx::client
