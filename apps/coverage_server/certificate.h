// TLS with a certificate that the server makes at start and signs itself. Its key never leaves the process.
#pragma once

#include <openssl/ssl.h>

#include <memory>
#include <string>

namespace vrx::coverage_server {

struct CertificateSettings {
    std::string file;  // where the certificate is written; when empty, a new temporary file
    std::string name;  // the host name; when empty, localhost and 127.0.0.1
    int days = 30;     // of validity; negative for a certificate that has expired
};

// The constructor throws std::runtime_error when the certificate cannot be made or written. The destructor removes its
// file.
class TlsContext {
public:
    explicit TlsContext(const CertificateSettings& settings);
    ~TlsContext();
    SSL_CTX* get() const { return context_.get(); }
    // A PEM file; a client that is given it trusts the server.
    const std::string& certificateFile() const { return file_; }

private:
    struct Freed {
        void operator()(SSL_CTX* context) const { SSL_CTX_free(context); }
    };
    std::string file_;
    std::unique_ptr<SSL_CTX, Freed> context_;
};

}  // namespace vrx::coverage_server
