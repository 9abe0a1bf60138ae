// TLS with a certificate of the server's own: made at start, signed by itself, its key never leaving the process.
#pragma once

#include <openssl/ssl.h>

#include <memory>
#include <string>

namespace vrx::coverage_server {

struct CertificateSettings {
    std::string file;  // where the certificate is written; a new file in the folder for temporary files when empty
    std::string name;  // another name than that of this machine (localhost, 127.0.0.1)
    int days = 30;     // of validity; negative for one that has expired
};

// The certificate's file is removed at the end. Throws std::runtime_error when one cannot be made or written.
class TlsContext {
public:
    explicit TlsContext(const CertificateSettings& settings);
    ~TlsContext();
    SSL_CTX* get() const { return context_.get(); }
    // The PEM file by which a client can be told to trust the server.
    const std::string& certificateFile() const { return file_; }

private:
    struct Freed {
        void operator()(SSL_CTX* context) const { SSL_CTX_free(context); }
    };
    std::string file_;
    std::unique_ptr<SSL_CTX, Freed> context_;
};

}  // namespace vrx::coverage_server
