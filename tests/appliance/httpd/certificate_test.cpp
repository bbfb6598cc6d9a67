// The certificate that the server makes for itself.

#include "appliance/httpd/certificate.h"

#include <gmock/gmock.h>
#include <openssl/pem.h>
#include <openssl/x509v3.h>
#include <sys/stat.h>

#include <ctime>

#include "appliance/httpd/door_certificate.h"
#include "tests/appliance/httpd/support.h"

namespace httpd_test {
namespace {

using appliance::CertificateFiles;
using appliance::CertificateState;
using appliance::DoorCertificate;
using ::testing::Contains;
using ::testing::HasSubstr;

struct FreeX509 {
    void operator()(X509* certificate) const {
        X509_free(certificate);
    }
};
using Certificate = std::unique_ptr<X509, FreeX509>;

class CertificateTest : public ::testing::Test {
protected:
    Certificate Load() {
        const std::string text = folder_.Read("certificate.pem");
        BIO* memory = BIO_new_mem_buf(text.data(), static_cast<int>(text.size()));
        Certificate certificate(PEM_read_bio_X509(memory, nullptr, nullptr, nullptr));
        BIO_free(memory);
        return certificate;
    }
    bool Make(const appliance::CertificateNames& names = {{"nas", "nas.example.com"}, {"10.0.0.5", "2001:db8::5"}}) {
        return appliance::MakeCertificate(files_, names, reason_);
    }
    // Puts one in place that ends when it is told to, signed with the own key.
    void MakeOneThatEnds(long inSeconds) {
        ASSERT_TRUE(Make());
        const Certificate certificate = Load();
        const std::string key = folder_.Read("key.pem");
        BIO* memory = BIO_new_mem_buf(key.data(), static_cast<int>(key.size()));
        EVP_PKEY* pair = PEM_read_bio_PrivateKey(memory, nullptr, nullptr, nullptr);
        BIO_free(memory);
        ASSERT_NE(X509_gmtime_adj(X509_getm_notAfter(certificate.get()), inSeconds), nullptr);
        ASSERT_GT(X509_sign(certificate.get(), pair, EVP_sha256()), 0);
        EVP_PKEY_free(pair);
        FILE* file = fopen(files_.certificate.c_str(), "w");
        PEM_write_X509(file, certificate.get());
        fclose(file);
    }

    Folder folder_;
    const CertificateFiles files_{folder_.At("certificate.pem"), folder_.At("key.pem")};
    std::string reason_;
};

TEST_F(CertificateTest, WhatIsInIt) {
    ASSERT_TRUE(Make()) << reason_;
    const Certificate certificate = Load();
    ASSERT_NE(certificate, nullptr);
    EXPECT_EQ(X509_check_host(certificate.get(), "nas", 0, 0, nullptr), 1);
    EXPECT_EQ(X509_check_host(certificate.get(), "nas.example.com", 0, 0, nullptr), 1);
    EXPECT_EQ(X509_check_host(certificate.get(), "other", 0, 0, nullptr), 0);
    EXPECT_EQ(X509_check_ip_asc(certificate.get(), "10.0.0.5", 0), 1);
    EXPECT_EQ(X509_check_ip_asc(certificate.get(), "2001:db8::5", 0), 1);
    EXPECT_EQ(X509_check_ip_asc(certificate.get(), "10.0.0.6", 0), 0);
    EVP_PKEY* key = X509_get0_pubkey(certificate.get());
    EXPECT_EQ(EVP_PKEY_get_base_id(key), EVP_PKEY_EC);
    EXPECT_EQ(EVP_PKEY_get_bits(key), 256);
    EXPECT_EQ(X509_verify(certificate.get(), key), 1);
    EXPECT_EQ(X509_check_ca(certificate.get()), 0);
    std::time_t inAYear = std::time(nullptr) + 366L * 24 * 3600;
    std::time_t inThreeYears = std::time(nullptr) + 3 * 366L * 24 * 3600;
    EXPECT_GT(X509_cmp_time(X509_get0_notAfter(certificate.get()), &inAYear), 0);
    EXPECT_LT(X509_cmp_time(X509_get0_notAfter(certificate.get()), &inThreeYears), 0);
    EXPECT_LT(X509_cmp_current_time(X509_get0_notBefore(certificate.get())), 0);
}

TEST_F(CertificateTest, TheKeyIsTheOwnersAlone) {
    ASSERT_TRUE(Make());
    struct stat found {};
    ASSERT_EQ(stat(files_.key.c_str(), &found), 0);
    EXPECT_EQ(found.st_mode & 07777, 0600u);
}

TEST_F(CertificateTest, EveryOneIsNew) {
    ASSERT_TRUE(Make());
    const std::string key = folder_.Read("key.pem");
    const Certificate first = Load();
    ASSERT_TRUE(Make());
    EXPECT_NE(folder_.Read("key.pem"), key);
    EXPECT_NE(ASN1_INTEGER_cmp(X509_get0_serialNumber(first.get()), X509_get0_serialNumber(Load().get())), 0);
}

TEST_F(CertificateTest, NamesThatAreNone) {
    EXPECT_TRUE(Make({{}, {}})) << reason_;
    EXPECT_TRUE(Make({{std::string(63, 'a') + "." + std::string(63, 'b')}, {}})) << reason_;
    EXPECT_EQ(X509_check_host(Load().get(), (std::string(63, 'a') + "." + std::string(63, 'b')).c_str(), 0, 0, nullptr),
              1);
}

TEST_F(CertificateTest, NamesOfThisMachine) {
    const appliance::CertificateNames names = appliance::NamesOfMachine();
    EXPECT_THAT(names.names, Contains("localhost"));
    EXPECT_THAT(names.addresses, Contains("127.0.0.1"));
    EXPECT_TRUE(Make(names)) << reason_;
}

TEST_F(CertificateTest, States) {
    EXPECT_EQ(appliance::ExamineCertificate(files_), CertificateState::Missing);
    ASSERT_TRUE(Make());
    EXPECT_EQ(appliance::ExamineCertificate(files_), CertificateState::Good);
    MakeOneThatEnds(29L * 24 * 3600);
    EXPECT_EQ(appliance::ExamineCertificate(files_), CertificateState::EndsSoon);
    MakeOneThatEnds(31L * 24 * 3600);
    EXPECT_EQ(appliance::ExamineCertificate(files_), CertificateState::Good);
    MakeOneThatEnds(-5);
    EXPECT_EQ(appliance::ExamineCertificate(files_), CertificateState::EndsSoon);
    const std::string certificate = folder_.Read("certificate.pem");
    ASSERT_TRUE(Make());
    folder_.Write("certificate.pem", certificate);
    EXPECT_EQ(appliance::ExamineCertificate(files_), CertificateState::Damaged) << "of another key";
    ASSERT_TRUE(Make());
    folder_.Write("certificate.pem", folder_.Read("certificate.pem").substr(0, 200));
    EXPECT_EQ(appliance::ExamineCertificate(files_), CertificateState::Damaged);
    ASSERT_TRUE(Make());
    folder_.Write("key.pem", "");
    EXPECT_EQ(appliance::ExamineCertificate(files_), CertificateState::Damaged);
    unlink(files_.key.c_str());
    EXPECT_EQ(appliance::ExamineCertificate(files_), CertificateState::Missing);
}

TEST_F(CertificateTest, TheOwnOneIsMadeWhenItIsNeeded) {
    DoorCertificate own(files_, true);
    ASSERT_TRUE(own.Load(reason_)) << reason_;
    EXPECT_NE(own.context(), nullptr);
    const std::string first = folder_.Read("certificate.pem");
    ASSERT_TRUE(own.Load(reason_));
    own.Renew();
    EXPECT_EQ(folder_.Read("certificate.pem"), first) << "good ones stay";
    for (const char* damage : {"certificate.pem", "key.pem"}) {
        folder_.Write(damage, "nonsense");
        ASSERT_TRUE(own.Load(reason_)) << reason_;
        EXPECT_EQ(appliance::ExamineCertificate(files_), CertificateState::Good);
    }
    MakeOneThatEnds(3600);
    const std::string ending = folder_.Read("certificate.pem");
    own.Renew();
    EXPECT_NE(folder_.Read("certificate.pem"), ending);
    EXPECT_EQ(appliance::ExamineCertificate(files_), CertificateState::Good);
}

TEST_F(CertificateTest, GivenOnesAreOnlyRead) {
    DoorCertificate given(files_, false);
    EXPECT_FALSE(given.Load(reason_));
    EXPECT_THAT(reason_, HasSubstr(files_.certificate));
    EXPECT_NE(access(files_.key.c_str(), F_OK), 0);
    MakeOneThatEnds(3600);
    const std::string ending = folder_.Read("certificate.pem");
    ASSERT_TRUE(given.Load(reason_)) << reason_;
    SSL_CTX* const before = given.context();
    given.Renew();
    EXPECT_EQ(folder_.Read("certificate.pem"), ending);
    folder_.Write("key.pem", "nonsense");
    EXPECT_FALSE(given.Load(reason_));
    EXPECT_THAT(reason_, HasSubstr(files_.key));
    EXPECT_EQ(given.context(), before) << "the one before stays in use";
}

TEST_F(CertificateTest, NoPlaceToWrite) {
    const CertificateFiles nowhere{folder_.At("missing/certificate.pem"), folder_.At("missing/key.pem")};
    DoorCertificate own(nowhere, true);
    EXPECT_FALSE(own.Load(reason_));
    EXPECT_THAT(reason_, HasSubstr("No such file"));
}

}  // namespace
}  // namespace httpd_test
