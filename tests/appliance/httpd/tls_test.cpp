// What TLS takes and what it does not.

#include "appliance/httpd/tls.h"

#include <gmock/gmock.h>
#include <sys/socket.h>

#include "appliance/httpd/door_certificate.h"
#include "tests/appliance/httpd/support.h"

namespace httpd_test {
namespace {

using appliance::DoorCertificate;
using ::testing::HasSubstr;

class TlsTest : public ::testing::Test {
protected:
    void Serve(bool isOwn = true) {
        WritePage(folder_);
        if (!isOwn) {
            ASSERT_TRUE(appliance::MakeCertificate(files_, {{"nas"}, {}}, reason_));
        }
        certificate_ = std::make_unique<DoorCertificate>(files_, isOwn);
        ASSERT_TRUE(certificate_->Load(reason_)) << reason_;
        vornd_ = std::make_unique<FakeVornd>(folder_.At("vornd.sock"));
        door_ = std::make_unique<DoorThread>(DoorThread::Wishes{folder_.At("page"), folder_.At("vornd.sock"),
                                                                certificate_.get(), limits_, "127.0.0.1:0"});
    }
    Client Connect(const std::function<void(SSL*)>& prepare = {}) {
        return Client(door_->port(), Client::Kind::Tls, prepare);
    }
    bool Connects(const std::function<void(SSL*)>& prepare) {
        return Connect(prepare).isOpen();
    }
    std::string Figure(const std::string& name) {
        const std::string text = Connect().Ask(GetText("/metrics")).body;
        const std::size_t place = text.find("\n" + name + " ");
        return place == std::string::npos
                   ? "none"
                   : text.substr(place + name.size() + 2, text.find('\n', place + 1) - place - name.size() - 2);
    }

    Folder folder_;
    const appliance::CertificateFiles files_{folder_.At("certificate.pem"), folder_.At("key.pem")};
    std::string reason_;
    appliance::DoorLimits limits_;
    std::unique_ptr<DoorCertificate> certificate_;
    std::unique_ptr<FakeVornd> vornd_;
    std::unique_ptr<DoorThread> door_;
};

TEST_F(TlsTest, EverythingGoesThroughIt) {
    Serve();
    Client client = Connect();
    ASSERT_TRUE(client.isOpen());
    EXPECT_EQ(client.Ask(GetText("/assets/app.js")).body, std::string(100000, 'a'));
    EXPECT_EQ(client.Ask(PostText("/webapi/A/1/b", "{}", kCookie + "Origin: https://nas:8443\r\n")).status(), 200);
    EXPECT_EQ(client.Ask(PostText("/webapi/A/1/b", "{}", kCookie + "Origin: http://nas:8443\r\n")).Code(), 251);
    client.Send(GetText("/", "Connection: close\r\n"));
    EXPECT_EQ(client.Receive().status(), 200);
    char byte = 0;
    EXPECT_EQ(SSL_read(client.ssl(), &byte, 1), 0);
    EXPECT_EQ(SSL_get_shutdown(client.ssl()) & SSL_RECEIVED_SHUTDOWN, SSL_RECEIVED_SHUTDOWN) << "its end is told";
}

TEST_F(TlsTest, Versions) {
    Serve();
    const auto only = [](int version) {
        return [version](SSL* ssl) {
            SSL_set_security_level(ssl, 0);
            SSL_set_min_proto_version(ssl, version);
            SSL_set_max_proto_version(ssl, version);
            SSL_set_cipher_list(ssl, "ALL:@SECLEVEL=0");
        };
    };
    EXPECT_TRUE(Connects(only(TLS1_3_VERSION)));
    EXPECT_TRUE(Connects(only(TLS1_2_VERSION)));
    EXPECT_FALSE(Connects(only(TLS1_1_VERSION)));
    EXPECT_FALSE(Connects(only(TLS1_VERSION)));
    EXPECT_EQ(Figure("vorn_httpd_handshakes_failed_total"), "2");
}

TEST_F(TlsTest, Ciphers) {
    Serve();
    const auto with = [this](const char* ciphers) {
        return Connects([ciphers](SSL* ssl) {
            SSL_set_security_level(ssl, 0);
            SSL_set_max_proto_version(ssl, TLS1_2_VERSION);
            SSL_set_cipher_list(ssl, ciphers);
        });
    };
    EXPECT_TRUE(with("ECDHE-ECDSA-AES128-GCM-SHA256"));
    EXPECT_TRUE(with("ECDHE-ECDSA-AES256-GCM-SHA384"));
    EXPECT_TRUE(with("ECDHE-ECDSA-CHACHA20-POLY1305"));
    for (const char* weak :
         {"ECDHE-ECDSA-AES128-SHA", "ECDHE-ECDSA-AES256-SHA384", "AES128-GCM-SHA256", "AES128-SHA",
          "ECDHE-ECDSA-AES128-CCM8", "DHE-RSA-AES128-GCM-SHA256", "aNULL:@SECLEVEL=0", "eNULL:@SECLEVEL=0"}) {
        EXPECT_FALSE(with(weak)) << weak;
    }
}

TEST_F(TlsTest, Protocols) {
    Serve();
    const auto offering = [](std::vector<unsigned char> protocols) {
        return [protocols](SSL* ssl) {
            SSL_set_alpn_protos(ssl, protocols.data(), static_cast<unsigned>(protocols.size()));
        };
    };
    Client client = Connect(offering({2, 'h', '2', 8, 'h', 't', 't', 'p', '/', '1', '.', '1'}));
    ASSERT_TRUE(client.isOpen());
    const unsigned char* chosen = nullptr;
    unsigned length = 0;
    SSL_get0_alpn_selected(client.ssl(), &chosen, &length);
    EXPECT_EQ(std::string(chosen, chosen + length), "http/1.1");
    EXPECT_FALSE(Connects(offering({2, 'h', '2'})));
    EXPECT_TRUE(Connects({}));
}

TEST_F(TlsTest, NoRenegotiation) {
    Serve();
    Client client = Connect([](SSL* ssl) { SSL_set_max_proto_version(ssl, TLS1_2_VERSION); });
    ASSERT_TRUE(client.isOpen());
    EXPECT_EQ(client.Ask(GetText("/")).status(), 200);
    SSL_renegotiate(client.ssl());
    EXPECT_NE(SSL_do_handshake(client.ssl()), 1);
}

TEST_F(TlsTest, SessionsAreResumed) {
    Serve();
    for (const int version : {TLS1_3_VERSION, TLS1_2_VERSION}) {
        Client first = Connect([version](SSL* ssl) { SSL_set_max_proto_version(ssl, version); });
        EXPECT_EQ(first.Ask(GetText("/")).status(), 200);
        SSL_SESSION* session = SSL_get1_session(first.ssl());
        Client second = Connect([version, session](SSL* ssl) {
            SSL_set_max_proto_version(ssl, version);
            SSL_set_session(ssl, session);
        });
        EXPECT_EQ(SSL_session_reused(second.ssl()), 1) << version;
        EXPECT_EQ(second.Ask(GetText("/")).status(), 200);
        SSL_SESSION_free(session);
    }
}

TEST_F(TlsTest, HandshakesHaveTheirOwnLimit) {
    limits_.handshake = milliseconds(3000);
    limits_.send = milliseconds(60000);
    limits_.idle = milliseconds(60000);
    Serve();
    const auto begin = std::chrono::steady_clock::now();
    Client silent(door_->port());
    Client begun(door_->port());
    begun.Send(std::string("\x16\x03\x01\x02\x00", 5));
    EXPECT_TRUE(silent.Ends(milliseconds(9000)));
    EXPECT_GE(std::chrono::steady_clock::now() - begin, limits_.handshake);
    EXPECT_TRUE(begun.Ends());
    EXPECT_EQ(Figure("vorn_httpd_handshakes_failed_total"), "2");
}

TEST_F(TlsTest, ClearTextIsToldWhereToGo) {
    Serve();
    const Message answer = Client(door_->port()).Ask(GetText("/"));
    EXPECT_EQ(answer.status(), 400);
    EXPECT_THAT(answer.body, HasSubstr("https://"));
    Client nonsense(door_->port());
    nonsense.Send(std::string(100, '\xFF'));
    EXPECT_TRUE(nonsense.Receive().first.empty());
}

TEST_F(TlsTest, BrowsersInsistOnTlsOnlyWithAGivenCertificate) {
    Serve();
    EXPECT_EQ(Connect().Ask(GetText("/")).header.count("strict-transport-security"), 0u);
    door_.reset();
    vornd_.reset();
    Serve(false);
    EXPECT_EQ(Connect().Ask(GetText("/")).header.at("strict-transport-security"), "max-age=31536000");
}

TEST_F(TlsTest, SecretsAreNotCompressedAndTicketsAreFew) {
    Serve();
    Client client = Connect();
    EXPECT_EQ(client.Ask(GetText("/")).status(), 200);
    EXPECT_EQ(SSL_get_current_compression(client.ssl()), nullptr);
}

TEST_F(TlsTest, ConnectionsBrokenInTheMiddle) {
    Serve();
    for (int count = 0; count < 50; ++count) {
        Client client = Connect();
        ASSERT_TRUE(client.isOpen());
        client.Send(GetText("/assets/app.js").substr(0, static_cast<std::size_t>(count)));
        if (count % 2 == 0) {
            client.Send(GetText("/assets/app.js"));
        }
        const linger atOnce{1, 0};
        setsockopt(client.socket(), SOL_SOCKET, SO_LINGER, &atOnce, sizeof atOnce);
    }
    EXPECT_EQ(Connect().Ask(GetText("/")).status(), 200);
    EXPECT_EQ(Figure("vorn_httpd_connections"), "1");
}

TEST(TlsFilesTest, FilesThatAreNotRight) {
    const Folder folder;
    std::string reason;
    const appliance::CertificateFiles files{folder.At("c"), folder.At("k")};
    const appliance::CertificateFiles others{folder.At("oc"), folder.At("ok")};
    ASSERT_TRUE(appliance::MakeCertificate(files, {{"a"}, {}}, reason));
    ASSERT_TRUE(appliance::MakeCertificate(others, {{"b"}, {}}, reason));
    EXPECT_NE(appliance::MakeTlsContext(files.certificate, files.key, reason), nullptr);
    EXPECT_EQ(appliance::MakeTlsContext(folder.At("missing"), files.key, reason), nullptr);
    EXPECT_THAT(reason, HasSubstr(folder.At("missing")));
    EXPECT_EQ(appliance::MakeTlsContext(files.certificate, folder.At("missing"), reason), nullptr);
    EXPECT_THAT(reason, HasSubstr(folder.At("missing")));
    EXPECT_EQ(appliance::MakeTlsContext(files.certificate, others.key, reason), nullptr);
    EXPECT_THAT(reason, HasSubstr("does not belong"));
    EXPECT_EQ(appliance::MakeTlsContext(files.key, files.key, reason), nullptr);
    EXPECT_EQ(reason.find('\n'), std::string::npos);
}

}  // namespace
}  // namespace httpd_test
