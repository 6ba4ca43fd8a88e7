// Channels that speak TLS: setting up, both ends, verification.
#include <openssl/conf.h>
#include <openssl/err.h>
#include <sys/socket.h>

#include <string_view>
#include <vector>

#include "ipc/channel-tls-fixture.h"
#include "ipc/pobject.h"
#include "ipc/stream.h"
#include "support/temp-dir.h"

namespace {

std::string Pattern(size_t size) {
    std::string out(size, '\0');
    for (size_t i = 0; i < size; ++i) out[i] = static_cast<char>(i * 31 % 251);
    return out;
}

TEST_F(ChannelTlsTest, AClientTalksToAnOpenSslServer) {
    Establish(TlsPeer::SERVER);
    ChannelSends("ask");
    EXPECT_EQ("ask", m_peer->Receive(3));
    m_peer->Send("told");
    EXPECT_EQ("told", ChannelReceives(4));
    EXPECT_EQ(0, m_result);
}

TEST_F(ChannelTlsTest, AServerTalksToAnOpenSslClient) {
    ConnectPeer(TlsPeer::CLIENT);
    // This client insists on a server whose certificate the authority has signed.
    X509_STORE* trusted = SSL_CTX_get_cert_store(SSL_get_SSL_CTX(m_peer->Get()));
    ASSERT_EQ(1, X509_STORE_add_cert(trusted, Certificates().authority.certificate.get()));
    SSL_set_verify(m_peer->Get(), SSL_VERIFY_PEER, nullptr);
    ASSERT_EQ(0, Convert(true));
    ASSERT_EQ(TlsPeer::DONE, m_outcome);
    m_peer->Send("ask");
    EXPECT_EQ("ask", ChannelReceives(3));
    ChannelSends("told");
    EXPECT_EQ("told", m_peer->Receive(4));
}

TEST_F(ChannelTlsTest, WhatTravelsCanNotBeRead) {
    ConnectPeer(TlsPeer::SERVER);
    ASSERT_EQ(0, Convert(false));
    ChannelSends("a secret");
    char bytes[512];
    const ssize_t count = recv(m_peer->Descriptor(), bytes, sizeof(bytes), 0);
    ASSERT_LT(8, count);
    EXPECT_EQ(std::string::npos, std::string(bytes, static_cast<size_t>(count)).find("a secret"));
}

TEST_F(ChannelTlsTest, AServerAndAClientOfOursTalkToEachOther) {
    QuickChannel server;
    ASSERT_EQ(0, server.Open(Connect(m_channel), true));
    m_channel.SkipVerification(false);
    auto other = std::async(std::launch::async, [&] { return server.ConvertToSSLChannel(true); });
    EXPECT_EQ(0, m_channel.ConvertToSSLChannel(false));
    ASSERT_EQ(0, other.get());
    // Values and a file, through all layers.
    const TempDir dir;
    const std::string content = Pattern(300000);
    PObject value;
    value["text"] = std::string(60000, 't');
    value["file"] = PObject::binary_type{0, content.size(), dir.Write("source", content)};
    PObject arrived;
    arrived["file"] = PObject::binary_type{0, 0, dir / "arrived"};
    other = std::async(std::launch::async, [&] { return PStream().Recv(server, arrived); });
    EXPECT_EQ(0, PStream().Send(m_channel, value));
    ASSERT_EQ(0, other.get());
    EXPECT_EQ(value["text"].AsString(), arrived["text"].AsString());
    EXPECT_TRUE(content == ReadWholeFile(dir / "arrived"));
    EXPECT_EQ(0, PStream().Send(server, PObject("thanks")));
    EXPECT_EQ(0, PStream().Recv(m_channel, arrived));
    EXPECT_EQ("thanks", arrived.AsString());
}

TEST_F(ChannelTlsTest, ATlsChannelIsNotConvertedAgain) {
    Establish(TlsPeer::SERVER);
    LogCapture log;
    EXPECT_EQ(0, m_channel.ConvertToSSLChannel(false));
    EXPECT_EQ(0, m_channel.ConvertToSSLChannel(true));
    EXPECT_EQ(2, log.Count("[WARN] ConvertToSSLChannel: Channel is SSL channel, no need to be "
                           "converted"));
    ChannelSends("still");
    EXPECT_EQ("still", m_peer->Receive(5));
}

TEST_F(ChannelTlsTest, AClosedChannelIsNotConverted) {
    LogCapture log;
    EXPECT_EQ(ERR_IO, m_channel.ConvertToSSLChannel(false));
    EXPECT_TRUE(log.Has("[ERR] set fd failed"));
    EXPECT_TRUE(m_channel.IsClosed());
}

TEST_F(ChannelTlsTest, EveryVersionThatTheLibraryStillSpeaksWill) {
    for (const int version : {TLS1_2_VERSION, TLS1_3_VERSION}) {
        for (const TlsPeer::Side side : {TlsPeer::SERVER, TlsPeer::CLIENT}) {
            ConnectPeer(side);
            PeerSpeaks(version);
            ASSERT_EQ(0, Convert(side == TlsPeer::CLIENT)) << version << " " << side;
            m_peer->Send("told");
            EXPECT_EQ("told", ChannelReceives(4));
            m_channel.Close();
        }
    }
}

TEST_F(ChannelTlsTest, ACipherThatTheLibraryHasNoMoreIsOnlyWarnedAbout) {
    ConnectPeer(TlsPeer::SERVER);
    LogCapture log;
    ASSERT_EQ(0, Convert(false));
    SSL_CTX* context = SSL_get_SSL_CTX(m_peer->Get());
    const bool has_cipher = SSL_CTX_set_cipher_list(context, "RC4-MD5") == 1;
    ERR_clear_error();
    EXPECT_EQ(!has_cipher, log.Has("[WARN] can't set cipher suit to SSL3_TXT_RSA_RC4_128_MD5"));
}

// What the configuration file of OpenSSL would say, while it lives.
class OpenSslConfiguration {
public:
    explicit OpenSslConfiguration(const std::string& ciphers) {
        const std::string path = m_dir.Write("openssl.cnf",
                                             "openssl_conf = main\n"
                                             "[main]\n"
                                             "ssl_conf = ssl\n"
                                             "[ssl]\n"
                                             "system_default = system\n"
                                             "[system]\n"
                                             "CipherString = " +
                                                 ciphers + "\n");
        EXPECT_EQ(1, CONF_modules_load_file(path.c_str(), nullptr, 0));
    }
    ~OpenSslConfiguration() {
        CONF_modules_finish();
        CONF_modules_load_file(nullptr, nullptr, CONF_MFLAGS_IGNORE_MISSING_FILE);
        ERR_clear_error();
    }
    OpenSslConfiguration(const OpenSslConfiguration&) = delete;
    OpenSslConfiguration& operator=(const OpenSslConfiguration&) = delete;

private:
    TempDir m_dir;
};

TEST_F(ChannelTlsTest, TheCiphersThatTheConfigurationFileAllowsStay) {
    const OpenSslConfiguration configuration("ECDHE-ECDSA-AES256-GCM-SHA384");
    Establish(TlsPeer::SERVER);
    std::vector<std::string> older;  // than those of TLS 1.3, which have a list of their own
    for (int i = 0; const char* name = SSL_get_cipher_list(m_channel.Ssl(), i); ++i) {
        if (!std::string_view(name).starts_with("TLS_")) older.emplace_back(name);
    }
    EXPECT_EQ(std::vector<std::string>{"ECDHE-ECDSA-AES256-GCM-SHA384"}, older);
}

// --- Verification

TEST_F(ChannelTlsTest, VerificationIsSkippedAtFirst) {
    ConnectPeer(TlsPeer::SERVER, Certificates().stranger);
    EXPECT_EQ(0, Convert(false));
}

TEST_F(ChannelTlsTest, ACertificateOfTheAuthorityPassesVerification) {
    ConnectPeer(TlsPeer::SERVER);
    m_channel.SkipVerification(false);
    EXPECT_EQ(0, Convert(false));
}

TEST_F(ChannelTlsTest, ACertificateOfAStrangerFailsVerification) {
    ConnectPeer(TlsPeer::SERVER, Certificates().stranger);
    m_channel.SkipVerification(false);
    LogCapture log;
    EXPECT_EQ(ERR_SSL_VERIFY, Convert(false));
    EXPECT_TRUE(log.Has("[ERR] ConvertToSSLChannel: Verify Fail!"));
    EXPECT_STREQ("SSL certificate verify fail", ErrorText(ERR_SSL_VERIFY));
}

// --- What was pending

// All that comes until the other end hangs up.
std::string RawRest(int descriptor) {
    std::string out;
    char bytes[4096];
    for (ssize_t count = 0; (count = recv(descriptor, bytes, sizeof(bytes), 0)) > 0;) {
        out.append(bytes, static_cast<size_t>(count));
    }
    return out;
}

TEST_F(ChannelTlsTest, WhatIsPendingTravelsInsideTls) {
    ConnectPeer(TlsPeer::SERVER);
    ASSERT_EQ(0, m_channel.Write("pending", 7));
    ASSERT_EQ(0, Convert(false));
    ASSERT_EQ(0, m_channel.FlushWrite(0));
    EXPECT_EQ("pending", m_peer->Receive(7));
}

TEST_F(ChannelTlsTest, WhatIsPendingIsNotSentInClearWhenPreparingFails) {
    const UniqueFd other(Connect(m_channel));
    ASSERT_EQ(0, m_channel.Write("a secret", 8));
    Channel::SetCertificatePaths("", "", Certificates().MissingFile());
    EXPECT_EQ(ERR_IO, m_channel.ConvertToSSLChannel(false));
    m_channel.Close();
    EXPECT_EQ("", RawRest(other.Get()));
}

TEST_F(ChannelTlsTest, WhatIsPendingIsNotSentInClearWhenTheHandshakeFails) {
    const UniqueFd other(Connect(m_channel));
    m_channel.WaitMilliseconds(1);
    ASSERT_EQ(0, m_channel.Write("a secret", 8));
    EXPECT_EQ(ERR_IO, m_channel.ConvertToSSLChannel(false));
    m_channel.Close();
    const std::string hello = RawRest(other.Get());
    EXPECT_NE("", hello);
    EXPECT_EQ(std::string::npos, hello.find("a secret"));
}

TEST_F(ChannelTlsTest, WhatIsPendingIsNotSentInClearWhenVerificationFails) {
    ConnectPeer(TlsPeer::SERVER, Certificates().stranger);
    m_channel.SkipVerification(false);
    ASSERT_EQ(0, m_channel.Write("a secret", 8));
    EXPECT_EQ(ERR_SSL_VERIFY, Convert(false));  // and closes
    EXPECT_EQ(std::string::npos, RawRest(m_peer->Descriptor()).find("a secret"));
}

// --- Files

class ChannelTlsFileTest : public ChannelTlsTest {
protected:
    // A conversion that fails before anything is sent.
    void ExpectFailure(bool server, const std::string& certificate, const std::string& key,
                       const std::string& trusted, const std::vector<std::string>& lines) {
        const UniqueFd other(Connect(m_channel));
        Channel::SetCertificatePaths(certificate, key, trusted);
        LogCapture log;
        EXPECT_EQ(ERR_IO, m_channel.ConvertToSSLChannel(server));
        for (const std::string& line : lines) EXPECT_TRUE(log.Has("[ERR] " + line)) << line;
        EXPECT_TRUE(log.Has("[ERR] Open: init ssl failed"));
        char byte = 0;
        EXPECT_EQ(-1, recv(other.Get(), &byte, 1, MSG_DONTWAIT));
        EXPECT_EQ(0UL, ERR_peek_error()) << "left for a later call";
        // The channel can be closed, and opened and converted again.
        EXPECT_FALSE(m_channel.IsClosed());
        m_channel.Close();
        SetUp();
        Establish(server ? TlsPeer::CLIENT : TlsPeer::SERVER);
        m_channel.Close();
    }
};

TEST_F(ChannelTlsFileTest, AServerWithoutACertificateFails) {
    for (const std::string& file : {Certificates().MissingFile(), Certificates().GarbageFile()}) {
        ExpectFailure(true, file, Certificates().ServerKeyFile(), "",
                      {"Install certificate failed", "Open: init ssl certificate failed"});
    }
}

TEST_F(ChannelTlsFileTest, AServerWithoutItsKeyFails) {
    for (const std::string& file : {Certificates().MissingFile(), Certificates().GarbageFile(),
                                    Certificates().StrangerKeyFile()}) {
        ExpectFailure(true, Certificates().ServerFile(), file, "",
                      {"Install private key failed", "Open: init ssl private key failed"});
    }
}

TEST_F(ChannelTlsFileTest, NobodyIsAskedForThePasswordOfAKey) {
    ExpectFailure(true, Certificates().ServerFile(), Certificates().LockedKeyFile(), "",
                  {"Install private key failed", "Open: init ssl private key failed"});
}

TEST_F(ChannelTlsFileTest, AClientWithoutTrustedCertificatesFails) {
    for (const std::string& file : {Certificates().MissingFile(), Certificates().GarbageFile()}) {
        ExpectFailure(false, "", "", file,
                      {"SSL_CTX_load_verify_locations(" + file + ") failed",
                       "InitSSL(): set Verify store fail"});
    }
}

// --- Closing

TEST_F(ChannelTlsTest, ClosingSaysGoodbye) {
    Establish(TlsPeer::SERVER);
    ASSERT_EQ(0, m_channel.Write("pending", 7));
    LogCapture log;
    m_channel.Close();
    EXPECT_TRUE(m_channel.IsClosed());
    EXPECT_TRUE(log.Contains("[DBG] destroy ssl obj 0x"));
    EXPECT_TRUE(log.Contains("[DBG] Channel: socket "));
    EXPECT_EQ("pending", m_peer->Receive(100));
    EXPECT_TRUE(m_peer->HasSaidGoodbye());
}

TEST_F(ChannelTlsTest, AfterClosingTheChannelIsAPlainOne) {
    Establish(TlsPeer::SERVER);
    m_channel.Close();
    const UniqueFd other(Connect(m_channel));
    ChannelSends("plain");
    char bytes[16] = {};
    EXPECT_EQ(5, recv(other.Get(), bytes, sizeof(bytes), 0));
    EXPECT_STREQ("plain", bytes);
}

TEST_F(ChannelTlsTest, ThePeersAddressIsToldThroughTls) {
    Establish(TlsPeer::SERVER);
    std::string ip;
    int port = 0;
    EXPECT_EQ(0, m_channel.GetPeerInfo(ip, port));
    EXPECT_EQ("127.0.0.1", ip);
    EXPECT_LT(0, port);
}

TEST_F(ChannelTlsTest, WhatWasSaidBeforeTheHandshakeIsDropped) {
    ConnectPeer(TlsPeer::SERVER);
    m_peer->SendRaw("xinjected");
    char byte = 0;
    ASSERT_EQ(0, m_channel.Read(&byte, 1));
    while (m_channel.Buffered().size() < 8) ASSERT_EQ(0, m_channel.ReadMore(1));
    ASSERT_EQ("injected", m_channel.Buffered());
    ASSERT_EQ(0, Convert(false));
    m_peer->Send("true");
    EXPECT_EQ("true", ChannelReceives(4));
}

}  // namespace
