#include "ipc/tls-certificates.h"

#include <gtest/gtest.h>
#include <openssl/pem.h>
#include <openssl/x509v3.h>

#include <cstdio>

namespace {

using UniqueFile = std::unique_ptr<FILE, FreeWith<fclose>>;
using UniqueExtension = std::unique_ptr<X509_EXTENSION, FreeWith<X509_EXTENSION_free>>;

void SetName(X509_NAME* name, const char* text) {
    EXPECT_EQ(1,
              X509_NAME_add_entry_by_txt(name, "CN", MBSTRING_UTF8,
                                         reinterpret_cast<const unsigned char*>(text), -1, -1, 0));
}

// Signed by `issuer`, or by itself.
TestIdentity MakeIdentity(const char* name, const TestIdentity* issuer, bool is_authority) {
    TestIdentity made{UniqueKey(EVP_EC_gen("P-256")), UniqueCertificate(X509_new())};
    X509* certificate = made.certificate.get();
    static long serial = 0;
    EXPECT_EQ(1, X509_set_version(certificate, 2));
    EXPECT_EQ(1, ASN1_INTEGER_set(X509_get_serialNumber(certificate), ++serial));
    EXPECT_EQ(1, ASN1_TIME_set_string(X509_getm_notBefore(certificate), "20000101000000Z"));
    EXPECT_EQ(1, ASN1_TIME_set_string(X509_getm_notAfter(certificate), "20990101000000Z"));
    EXPECT_EQ(1, X509_set_pubkey(certificate, made.key.get()));
    SetName(X509_get_subject_name(certificate), name);
    X509* signer = issuer != nullptr ? issuer->certificate.get() : certificate;
    EXPECT_EQ(1, X509_set_issuer_name(certificate, X509_get_subject_name(signer)));
    const UniqueExtension constraints(X509V3_EXT_conf_nid(
        nullptr, nullptr, NID_basic_constraints, is_authority ? "critical,CA:TRUE" : "CA:FALSE"));
    EXPECT_EQ(1, X509_add_ext(certificate, constraints.get(), -1));
    EVP_PKEY* key = issuer != nullptr ? issuer->key.get() : made.key.get();
    EXPECT_LT(0, X509_sign(certificate, key, EVP_sha256()));
    return made;
}

void WriteCertificate(const std::string& path, const TestIdentity& identity) {
    const UniqueFile file(fopen(path.c_str(), "we"));
    EXPECT_EQ(1, PEM_write_X509(file.get(), identity.certificate.get()));
}

void WriteKey(const std::string& path, const TestIdentity& identity, const char* password) {
    const UniqueFile file(fopen(path.c_str(), "we"));
    const auto* bytes = reinterpret_cast<const unsigned char*>(password);
    EXPECT_EQ(1, PEM_write_PrivateKey(file.get(), identity.key.get(),
                                      password != nullptr ? EVP_aes_128_cbc() : nullptr, bytes,
                                      password != nullptr ? 6 : 0, nullptr, nullptr));
}

}  // namespace

TestCertificates::TestCertificates()
    : authority(MakeIdentity("Authority", nullptr, true)),
      server(MakeIdentity("127.0.0.1", &authority, false)),
      stranger(MakeIdentity("Stranger", nullptr, false)) {
    WriteCertificate(AuthorityFile(), authority);
    WriteCertificate(ServerFile(), server);
    WriteCertificate(StrangerFile(), stranger);
    WriteKey(ServerKeyFile(), server, nullptr);
    WriteKey(StrangerKeyFile(), stranger, nullptr);
    WriteKey(LockedKeyFile(), server, "secret");
    m_dir.Write("garbage.pem", "no certificate\n");
}
