#include "coverage_server/server_version_document.h"

#include <sys/stat.h>
#include <zlib.h>

#include <algorithm>
#include <array>
#include <charconv>
#include <fstream>
#include <iterator>
#include <optional>
#include <sstream>
#include <stdexcept>
#include <vector>

namespace vrx::coverage_server {

namespace {

constexpr std::string_view binaryMagic = "bplist00";

struct Entry {
    std::string key;
    std::string value;
    bool isString;
};

std::optional<std::int64_t> integerOf(const std::string& text) {
    std::int64_t number = 0;
    const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), number);
    if (error != std::errc() || end != text.data() + text.size()) return std::nullopt;
    return number;
}

std::vector<Entry> entriesOf(const ServerVersionSettings& settings) {
    std::vector<Entry> entries;
    auto add = [&](const char* key, const std::string& value) {
        if (value != "none") entries.push_back({key, value, settings.versionsAsStrings || !integerOf(value)});
    };
    add("LowServerVersion", settings.lowVersion);
    add("HighServerVersion", settings.highVersion);
    return entries;
}

std::string xmlEscaped(const std::string& text) {
    std::string escaped;
    for (char c : text) {
        if (c == '&')
            escaped += "&amp;";
        else if (c == '<')
            escaped += "&lt;";
        else
            escaped += c;
    }
    return escaped;
}

std::string xmlDocument(const std::vector<Entry>& entries) {
    std::string text = std::string(xmlPropertyListBegin) + "<dict>\n";
    for (const Entry& entry : entries) {
        const char* tag = entry.isString ? "string" : "integer";
        text += "\t<key>" + entry.key + "</key>\n\t<" + tag + ">" + xmlEscaped(entry.value) + "</" + tag + ">\n";
    }
    return text + "</dict>\n</plist>\n";
}

std::string bigEndian(std::uint64_t number, int bytes) {
    std::string text;
    for (int shift = (bytes - 1) * 8; shift >= 0; shift -= 8) text += static_cast<char>(number >> shift & 0xff);
    return text;
}

std::string marked(unsigned kind, std::size_t size) {
    if (size < 15) return bigEndian(kind << 4 | size, 1);
    return bigEndian(kind << 4 | 15, 1) + bigEndian(0x10, 1) + bigEndian(size, 1);
}

// The objects, of which the last is the root, then the offset of each, then the trailer.
std::string binaryFile(const std::vector<std::string>& objects) {
    std::string text(binaryMagic), offsets;
    for (const std::string& object : objects) {
        offsets += bigEndian(text.size(), 2);
        text += object;
    }
    const std::size_t offsetsAt = text.size();
    return text + offsets + bigEndian(0, 6) + bigEndian(2, 1) + bigEndian(1, 1) + bigEndian(objects.size(), 8) +
           bigEndian(objects.size() - 1, 8) + bigEndian(offsetsAt, 8);
}

std::string binaryDocument(const std::vector<Entry>& entries) {
    std::vector<std::string> objects;
    std::string keys, values;
    auto add = [&](std::string object) {
        objects.push_back(std::move(object));
        return bigEndian(objects.size() - 1, 1);
    };
    for (const Entry& entry : entries) {
        keys += add(marked(5, entry.key.size()) + entry.key);
        const std::string value = entry.value.substr(0, 200);
        values +=
            add(entry.isString ? marked(5, value.size()) + value
                               : bigEndian(0x13, 1) + bigEndian(static_cast<std::uint64_t>(*integerOf(value)), 8));
    }
    add(marked(13, entries.size()) + keys + values);
    return binaryFile(objects);
}

std::string httpDate(std::time_t time) {
    std::tm parts{};
    std::array<char, 64> text{};
    gmtime_r(&time, &parts);
    return {text.data(), std::strftime(text.data(), text.size(), "%a, %d %b %Y %H:%M:%S GMT", &parts)};
}

std::string etagOf(const std::string& document) {
    std::ostringstream text;
    text << '"' << std::hex
         << crc32(0, reinterpret_cast<const Bytef*>(document.data()), static_cast<uInt>(document.size())) << '-'
         << document.size() << '"';
    return text.str();
}

bool isUnchanged(const httplib::Request& request, const std::string& etag, const std::string& modified) {
    if (request.has_header("If-None-Match")) {
        const std::string known = request.get_header_value("If-None-Match");
        return known == "*" || (!etag.empty() && known.find(etag) != known.npos);
    }
    std::tm parts{};
    if (modified.empty() || !request.has_header("If-Modified-Since")) return false;
    auto read = [&parts](const std::string& date) {
        return strptime(date.c_str(), "%a, %d %b %Y %H:%M:%S GMT", &parts) ? timegm(&parts) : 0;
    };
    const std::time_t known = read(request.get_header_value("If-Modified-Since"));
    return known != 0 && read(modified) <= known;
}

ServerVersionSettings changed(ServerVersionSettings settings, const Json& changes) {
    auto versionOf = [](const Json& value) {
        if (value.is_number_integer()) return std::to_string(value.get<std::int64_t>());
        return value.is_null() ? std::string("none") : value.get<std::string>();
    };
    if (!changes.is_object()) throw std::invalid_argument("the settings are an object");
    for (const auto& [name, value] : changes.items()) {
        if (name == "lowVersion")
            settings.lowVersion = versionOf(value);
        else if (name == "highVersion")
            settings.highVersion = versionOf(value);
        else if (name == "versionsAsStrings")
            settings.versionsAsStrings = value.get<bool>();
        else if (name == "binary")
            settings.isBinary = value.get<bool>();
        else if (name == "file")
            settings.file = value.get<std::string>();
        else if (name == "cacheControl")
            settings.cacheControl = value.get<std::string>();
        else if (name == "etag")
            settings.etag = value.get<bool>();
        else if (name == "lastModified")
            settings.lastModified = value.get<bool>();
        else if (name == "conditional")
            settings.conditional = value.get<bool>();
        else
            throw std::invalid_argument("no such setting: " + name);
    }
    return settings;
}

}  // namespace

std::string arrayLike(const std::string& document) {
    if (document.starts_with(binaryMagic)) return binaryFile({marked(10, 0)});
    return std::string(xmlPropertyListBegin) + "<array/>\n</plist>\n";
}

ServerVersionDocument::ServerVersionDocument(ServerVersionSettings settings)
    : settings_(std::move(settings)), changed_(std::time(nullptr)) {}

void ServerVersionDocument::answer(const httplib::Request& request, httplib::Response& response) const {
    std::unique_lock lock(mutex_);
    const ServerVersionSettings settings = settings_;
    std::time_t changed = changed_;
    lock.unlock();

    std::string document;
    struct stat status {};
    if (settings.file.empty()) {
        const std::vector<Entry> entries = entriesOf(settings);
        document = settings.isBinary ? binaryDocument(entries) : xmlDocument(entries);
    } else {
        std::ifstream file(settings.file, std::ios::binary);
        if (!file || stat(settings.file.c_str(), &status) != 0) {
            response.status = 404;
            return response.set_content("cannot read " + settings.file + "\n", "text/plain");
        }
        document.assign(std::istreambuf_iterator<char>(file), {});
        changed = status.st_mtime;
    }

    const std::string etag = settings.etag ? etagOf(document) : "";
    const std::string modified = settings.lastModified ? httpDate(changed) : "";
    if (!settings.cacheControl.empty()) response.set_header("Cache-Control", settings.cacheControl);
    if (!etag.empty()) response.set_header("ETag", etag);
    if (!modified.empty()) response.set_header("Last-Modified", modified);
    if (settings.conditional && isUnchanged(request, etag, modified)) {
        response.status = 304;
        return;
    }
    response.status = 200;
    response.set_content(document, "application/x-plist");
}

Json ServerVersionDocument::json() const {
    std::lock_guard lock(mutex_);
    return {{"lowVersion", settings_.lowVersion},
            {"highVersion", settings_.highVersion},
            {"versionsAsStrings", settings_.versionsAsStrings},
            {"binary", settings_.isBinary},
            {"file", settings_.file},
            {"cacheControl", settings_.cacheControl},
            {"etag", settings_.etag},
            {"lastModified", settings_.lastModified},
            {"conditional", settings_.conditional}};
}

void ServerVersionDocument::change(const Json& changes) {
    std::lock_guard lock(mutex_);
    settings_ = changed(settings_, changes);
    changed_ = std::time(nullptr);
}

}  // namespace vrx::coverage_server
