#include "coverage_server/certificate.h"

#include <fcntl.h>
#include <openssl/ec.h>
#include <openssl/err.h>
#include <openssl/pem.h>
#include <openssl/x509v3.h>
#include <stdlib.h>
#include <unistd.h>

#include <cstdio>
#include <filesystem>
#include <stdexcept>

namespace vrx::coverage_server {

namespace {

struct OpenSslFreed {
    void operator()(EVP_PKEY* key) const { EVP_PKEY_free(key); }
    void operator()(X509* certificate) const { X509_free(certificate); }
    void operator()(X509_EXTENSION* extension) const { X509_EXTENSION_free(extension); }
};
using Key = std::unique_ptr<EVP_PKEY, OpenSslFreed>;
using Certificate = std::unique_ptr<X509, OpenSslFreed>;

void demand(bool isDone, const char* what) {
    if (!isDone) throw std::runtime_error(std::string("TLS: ") + what);
}

void addExtension(X509* certificate, int id, const std::string& value) {
    X509V3_CTX context;
    X509V3_set_ctx_nodb(&context);
    X509V3_set_ctx(&context, certificate, certificate, nullptr, nullptr, 0);
    std::unique_ptr<X509_EXTENSION, OpenSslFreed> extension(X509V3_EXT_conf_nid(nullptr, &context, id, value.c_str()));
    demand(extension && X509_add_ext(certificate, extension.get(), -1) == 1, "cannot name the certificate");
}

Certificate makeCertificate(EVP_PKEY* key, const CertificateSettings& settings) {
    const std::string name = settings.name.empty() ? "localhost" : settings.name;
    Certificate certificate(X509_new());
    demand(certificate != nullptr, "out of memory");
    X509* made = certificate.get();
    X509_set_version(made, X509_VERSION_3);
    ASN1_INTEGER_set(X509_get_serialNumber(made), getpid());
    // It begins in the past, because clocks differ. One that has expired begins a day before it ends.
    const long day = 86400;
    X509_gmtime_adj(X509_getm_notBefore(made), -day * (settings.days < 0 ? 1 - settings.days : 1));
    X509_gmtime_adj(X509_getm_notAfter(made), day * settings.days);
    X509_set_pubkey(made, key);
    X509_NAME* subject = X509_get_subject_name(made);
    X509_NAME_add_entry_by_txt(subject, "CN", MBSTRING_UTF8, reinterpret_cast<const unsigned char*>(name.c_str()), -1,
                               -1, 0);
    X509_set_issuer_name(made, subject);
    addExtension(made, NID_basic_constraints, "critical,CA:TRUE");
    addExtension(made, NID_subject_key_identifier, "hash");
    addExtension(made, NID_subject_alt_name,
                 settings.name.empty() ? "DNS:localhost,IP:127.0.0.1" : "DNS:" + settings.name);
    demand(X509_sign(made, key, EVP_sha256()) > 0, "cannot sign the certificate");
    return certificate;
}

int openNew(std::string& path) {
    if (!path.empty()) return open(path.c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC, 0644);
    path = std::filesystem::temp_directory_path() / "vrx-coverage-server-XXXXXX.pem";
    return mkostemps(path.data(), 4, O_CLOEXEC);
}

}  // namespace

TlsContext::TlsContext(const CertificateSettings& settings)
    : file_(settings.file), context_(SSL_CTX_new(TLS_server_method())) {
    Key key(EVP_EC_gen("P-256"));
    demand(context_ && key, "cannot make a key");
    const Certificate certificate = makeCertificate(key.get(), settings);
    demand(SSL_CTX_use_certificate(get(), certificate.get()) == 1 && SSL_CTX_use_PrivateKey(get(), key.get()) == 1,
           "cannot use the certificate");
    SSL_CTX_set_min_proto_version(get(), TLS1_2_VERSION);

    const int descriptor = openNew(file_);
    demand(descriptor >= 0, ("cannot write " + file_).c_str());
    std::unique_ptr<std::FILE, int (*)(std::FILE*)> file(fdopen(descriptor, "w"), std::fclose);
    demand(file && PEM_write_X509(file.get(), certificate.get()) == 1 && std::fflush(file.get()) == 0,
           ("cannot write " + file_).c_str());
}

TlsContext::~TlsContext() {
    unlink(file_.c_str());
}

}  // namespace vrx::coverage_server
