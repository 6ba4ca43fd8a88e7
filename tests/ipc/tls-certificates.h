// Certificates for tests, made on the spot: an authority, what it has signed, and what it has not.
#pragma once

#include <openssl/evp.h>
#include <openssl/x509.h>

#include <memory>
#include <string>

#include "support/temp-dir.h"
#include "utils/unique-fd.h"

using UniqueKey = std::unique_ptr<EVP_PKEY, FreeWith<EVP_PKEY_free>>;
using UniqueCertificate = std::unique_ptr<X509, FreeWith<X509_free>>;

// A key and the certificate for it.
struct TestIdentity {
    UniqueKey key;
    UniqueCertificate certificate;
};

// All as files in PEM form, below one scratch folder.
class TestCertificates {
public:
    TestCertificates();

    const TestIdentity authority;
    const TestIdentity server;    // signed by the authority
    const TestIdentity stranger;  // signed by itself

    [[nodiscard]] std::string AuthorityFile() const { return m_dir / "authority.pem"; }
    [[nodiscard]] std::string ServerFile() const { return m_dir / "server.pem"; }
    [[nodiscard]] std::string ServerKeyFile() const { return m_dir / "server.key"; }
    [[nodiscard]] std::string StrangerFile() const { return m_dir / "stranger.pem"; }
    [[nodiscard]] std::string StrangerKeyFile() const { return m_dir / "stranger.key"; }
    // The server's key behind a password.
    [[nodiscard]] std::string LockedKeyFile() const { return m_dir / "locked.key"; }
    [[nodiscard]] std::string GarbageFile() const { return m_dir / "garbage.pem"; }
    [[nodiscard]] std::string MissingFile() const { return m_dir / "missing.pem"; }

private:
    TempDir m_dir;
};
