#include "coverage_server/misbehaviour.h"

#include <zlib.h>

#include <algorithm>
#include <limits>
#include <random>
#include <stdexcept>

#include "coverage_server/server_version_document.h"

namespace vrx::coverage_server {

namespace {

constexpr std::size_t pieceBytes = 1024 * 1024;

std::string randomBytes(std::uint64_t size) {
    std::independent_bits_engine<std::mt19937, 8, unsigned> random{std::random_device{}()};
    std::string bytes(size, '\0');
    std::ranges::generate(bytes, [&] { return static_cast<char>(random()); });
    return bytes;
}

std::string head(int status, std::uint64_t length, const httplib::Headers& headers) {
    std::string text = "HTTP/1.1 " + std::to_string(status) + (status == 200 ? " OK" : " -") + "\r\n";
    for (const auto& [name, value] : headers)
        if (name != "Content-Length") text.append(name).append(": ").append(value).append("\r\n");
    return text + "Content-Length: " + std::to_string(length) + "\r\n\r\n";
}

const char* mediaType(Endpoint endpoint) {
    return endpoint == Endpoint::ServerVersion ? "application/x-plist" : "application/json";
}

// A valid document of the endpoint, which may have any number of letters between its begin and end.
struct Padded {
    std::string begin;
    std::string end;
};

Padded paddedDocument(Endpoint endpoint) {
    if (endpoint == Endpoint::ServerVersion)
        return {std::string(xmlPropertyListBegin) +
                    "<dict><key>LowServerVersion</key><integer>2</integer><key>HighServerVersion</key>"
                    "<integer>3</integer><key>Padding</key><string>",
                "</string></dict></plist>\n"};
    std::string begin = R"({"covered":true)";
    if (endpoint == Endpoint::Catalogue) begin = R"({"items":[])";
    if (endpoint == Endpoint::Purchases) begin = R"({"purchases":[])";
    return {begin + R"(,"padding":")", R"("})"};
}

void sendLarge(std::uint64_t size, Endpoint endpoint, Connection& connection) {
    const Padded document = paddedDocument(endpoint);
    const std::uint64_t ends = document.begin.size() + document.end.size();
    std::uint64_t left = size > ends ? size - ends : 0;
    connection.takeOver(200);
    bool isTaken = connection.send(head(200, ends + left, {{"Content-Type", mediaType(endpoint)}}) + document.begin);
    const std::string piece(pieceBytes, 'x');
    for (; isTaken && left > 0; left -= std::min<std::uint64_t>(left, piece.size()))
        isTaken = connection.send(std::string_view(piece).substr(0, std::min<std::uint64_t>(left, piece.size())));
    if (isTaken) connection.send(document.end);
}

class Deflater {
public:
    Deflater() {
        if (deflateInit2(&stream_, Z_BEST_COMPRESSION, Z_DEFLATED, -MAX_WBITS, MAX_MEM_LEVEL, Z_DEFAULT_STRATEGY) !=
            Z_OK)
            throw std::runtime_error("zlib");
    }
    ~Deflater() { deflateEnd(&stream_); }
    Deflater(const Deflater&) = delete;
    Deflater& operator=(const Deflater&) = delete;

    std::string deflated(std::string_view bytes, int flush) {
        std::string out(deflateBound(&stream_, bytes.size()) + 64, '\0');
        stream_.next_in = reinterpret_cast<Bytef*>(const_cast<char*>(bytes.data()));
        stream_.avail_in = static_cast<uInt>(bytes.size());
        stream_.next_out = reinterpret_cast<Bytef*>(out.data());
        stream_.avail_out = static_cast<uInt>(out.size());
        deflate(&stream_, flush);
        out.resize(out.size() - stream_.avail_out);
        return out;
    }

private:
    z_stream stream_{};
};

uLong crcOf(std::string_view bytes) {
    return crc32(0, reinterpret_cast<const Bytef*>(bytes.data()), static_cast<uInt>(bytes.size()));
}

std::string littleEndian(std::uint32_t number) {
    std::string bytes;
    for (int shift = 0; shift < 32; shift += 8) bytes += static_cast<char>(number >> shift & 0xff);
    return bytes;
}

// What follows a full flush refers to nothing before it. The piece is therefore compressed only once and then repeated,
// which takes little time for any size.
void sendBomb(std::uint64_t size, Endpoint endpoint, Connection& connection) {
    const Padded document = paddedDocument(endpoint);
    const std::string piece(pieceBytes, 'x');
    const std::uint64_t pieces = std::max<std::uint64_t>(1, size / piece.size());
    Deflater deflater;
    const std::string begin = deflater.deflated(document.begin, Z_FULL_FLUSH);
    const std::string middle = deflater.deflated(piece, Z_FULL_FLUSH);
    const std::string end = deflater.deflated(document.end, Z_FINISH);

    uLong crc = crcOf(document.begin);
    const uLong pieceCrc = crcOf(piece);
    for (std::uint64_t i = 0; i < pieces; ++i) crc = crc32_combine(crc, pieceCrc, static_cast<z_off_t>(piece.size()));
    crc = crc32_combine(crc, crcOf(document.end), static_cast<z_off_t>(document.end.size()));
    const std::uint64_t inflated = document.begin.size() + pieces * piece.size() + document.end.size();
    constexpr char gzipHead[] = {'\x1f', '\x8b', '\x08', 0, 0, 0, 0, 0, 0, '\x03'};
    const std::string gzipEnd =
        littleEndian(static_cast<std::uint32_t>(crc)) + littleEndian(static_cast<std::uint32_t>(inflated));

    connection.takeOver(200);
    const std::uint64_t length = sizeof gzipHead + begin.size() + pieces * middle.size() + end.size() + gzipEnd.size();
    bool isTaken =
        connection.send(head(200, length, {{"Content-Type", mediaType(endpoint)}, {"Content-Encoding", "gzip"}}) +
                        std::string(gzipHead, sizeof gzipHead) + begin);
    for (std::uint64_t i = 0; isTaken && i < pieces; ++i) isTaken = connection.send(middle);
    if (isTaken) connection.send(end + gzipEnd);
}

void sendDripping(const httplib::Response& response, Milliseconds each, Connection& connection) {
    connection.takeOver(response.status);
    bool isTaken = connection.send(head(response.status, response.body.size(), response.headers));
    for (std::size_t i = 0; isTaken && i < response.body.size(); ++i)
        isTaken = connection.pause(each) && connection.send(std::string_view(response.body).substr(i, 1));
}

void sendWithLength(const httplib::Response& response, std::uint64_t length, std::string_view body,
                    Connection& connection) {
    connection.takeOver(response.status);
    if (connection.send(head(response.status, length, response.headers))) connection.send(body);
}

void sendLargeHeaders(std::uint64_t size, Connection& connection) {
    const std::string value(1000, 'x');
    connection.takeOver(200);
    std::string text = "HTTP/1.1 200 OK\r\nContent-Length: 0\r\n";
    while (text.size() < size) text += "X-Padding-" + std::to_string(text.size()) + ": " + value + "\r\n";
    connection.send(text + "\r\n");
}

void sendRandom(std::uint64_t size, Connection& connection) {
    connection.takeOver(0);
    connection.send(randomBytes(size));
    connection.endAbruptly(false);
}

void endUnanswered(Connection& connection, bool withReset) {
    connection.takeOver(0);
    connection.endAbruptly(withReset);
}

void hang(Connection& connection) {
    connection.takeOver(0);
    connection.holdUntilClientLeaves();
    connection.endAbruptly(false);
}

void answer(httplib::Response& response, const std::string& body, const char* type) {
    response.status = 200;
    response.headers.clear();
    response.set_content(body, type);
}

// Replaces the document of the genuine answer, which keeps its caching; an answer without a document stays as it is.
void bend(httplib::Response& response, const std::string& body) {
    if (response.status != 200) return;
    const std::string type = response.get_header_value("Content-Type");
    const std::string cacheControl = response.get_header_value("Cache-Control");
    answer(response, body, type.c_str());
    if (!cacheControl.empty()) response.set_header("Cache-Control", cacheControl);
}

void setNulls(Json& object, const std::string& name) {
    if (!object.is_object()) return;
    if (!name.empty())
        object[name] = nullptr;
    else
        for (Json& member : object) member = nullptr;
}

std::string withNulls(Endpoint endpoint, const std::string& body, const std::string& name) {
    Json json = Json::parse(body, nullptr, false);
    if (json.is_discarded()) return body;
    if (endpoint == Endpoint::Coverage)
        setNulls(json, name);
    else  // the store's answer has one member, a list
        for (Json& list : json)
            for (Json& entry : list) setNulls(entry, name);
    return dumped(json);
}

std::string nested(Endpoint endpoint, std::uint64_t depth) {
    std::string begin = "[", end = "]", document;
    if (endpoint == Endpoint::ServerVersion) begin = "<array>", end = "</array>", document = xmlPropertyListBegin;
    document.reserve(document.size() + depth * (begin.size() + end.size()) + 16);
    for (std::uint64_t i = 0; i < depth; ++i) document += begin;
    for (std::uint64_t i = 0; i < depth; ++i) document += end;
    return endpoint == Endpoint::ServerVersion ? document + "</plist>\n" : document;
}

}  // namespace

bool misbehave(const FaultPlan& plan, Connection& connection) {
    if (!connection.pause(plan.delay)) return false;
    if (!plan.fault) return true;
    const Fault& fault = *plan.fault;
    switch (fault.kind->kind) {
        case FaultKind::Hang: hang(connection); break;
        case FaultKind::NotHttp: sendRandom(fault.number, connection); break;
        default: endUnanswered(connection, fault.kind->kind == FaultKind::Reset);
    }
    return false;
}

void misbehave(const Fault& fault, Endpoint endpoint, const httplib::Request& request, httplib::Response& response,
               Connection& connection) {
    const std::string& body = response.body;
    switch (fault.kind->kind) {
        case FaultKind::Status:
            answer(response, R"({"reason":"as the fault wants"})", "application/json");
            response.status = static_cast<int>(fault.number);
            return;
        case FaultKind::Delay:
        case FaultKind::Hold: return;
        case FaultKind::Drop:
            sendWithLength(response, body.size(), std::string_view(body).substr(0, body.size() / 2), connection);
            return connection.endAbruptly(false);
        case FaultKind::Reset: return endUnanswered(connection, true);
        case FaultKind::Close: return endUnanswered(connection, false);
        case FaultKind::Hang: return hang(connection);
        case FaultKind::Garbage: return answer(response, randomBytes(fault.number), mediaType(endpoint));
        case FaultKind::NotHttp: return sendRandom(fault.number, connection);
        case FaultKind::NotJson:
            return answer(response, "<!DOCTYPE html><html><body><h1>Sign in to this network</h1></body></html>\n",
                          "text/html");
        case FaultKind::Array:
            return bend(response, endpoint == Endpoint::ServerVersion ? arrayLike(body) : "[" + body + "]");
        case FaultKind::Nulls: return bend(response, withNulls(endpoint, body, fault.value));
        case FaultKind::Body: return answer(response, fault.value, mediaType(endpoint));
        case FaultKind::Empty: return answer(response, "", mediaType(endpoint));
        case FaultKind::Large: return sendLarge(fault.number, endpoint, connection);
        case FaultKind::Bomb: return sendBomb(fault.number, endpoint, connection);
        case FaultKind::Deep: return answer(response, nested(endpoint, fault.number), mediaType(endpoint));
        case FaultKind::Redirect:
            // The prefix is put before the path that was asked for.
            return response.set_redirect(fault.value == "/moved" ? fault.value + request.target : fault.value,
                                         fault.code);
        case FaultKind::Drip: return sendDripping(response, fault.time, connection);
        case FaultKind::LengthLong: return sendWithLength(response, body.size() + fault.number, body, connection);
        case FaultKind::LengthShort:
            return sendWithLength(response, body.size() - std::min<std::uint64_t>(fault.number, body.size()), body,
                                  connection);
        case FaultKind::LargeHeaders: return sendLargeHeaders(fault.number, connection);
    }
}

}  // namespace vrx::coverage_server
