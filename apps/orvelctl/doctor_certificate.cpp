// The certificate of orvel-web: whether it is there, fits its key, and how long it is valid.
#include <openssl/err.h>
#include <openssl/pem.h>
#include <openssl/x509.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cstdio>
#include <ctime>
#include <memory>

#include "base/owner.h"
#include "doctor_checks.h"
#include "vexo/settings.h"
#include "vexo/system_root.h"

namespace orvel::ctl {
namespace {

constexpr const char* kSettings = "/etc/orvel/web.conf";
constexpr const char* kOwnFolder = "/var/lib/orvel-web";
constexpr int kSoon = 21;  // days

using File = std::unique_ptr<FILE, Releaser<fclose>>;

std::string webSetting(const char* key) {
    char value[4096] = {};
    VLIBCFileGetKeyValue(kSettings, key, value, sizeof value, 0);
    return value;
}

int noPassword(char* /*buffer*/, int /*size*/, int /*writing*/, void* /*argument*/) {
    return 0;
}

// What is wrong with them; "" with the days for which the certificate is still valid.
std::string judge(const std::string& certificate, const std::string& key, int& days) {
    const File certificateFile(fopen(certificate.c_str(), "re"));
    if (certificateFile == nullptr) return "the certificate cannot be read";
    const std::unique_ptr<X509, Releaser<X509_free>> read(
        PEM_read_X509(certificateFile.get(), nullptr, noPassword, nullptr));
    if (read == nullptr) return "the file is no certificate in PEM form";
    const File keyFile(fopen(key.c_str(), "re"));
    if (keyFile == nullptr) return "its key " + key + " cannot be read";
    const std::unique_ptr<EVP_PKEY, Releaser<EVP_PKEY_free>> secret(
        PEM_read_PrivateKey(keyFile.get(), nullptr, noPassword, nullptr));
    if (secret == nullptr) return key + " holds no key in PEM form, or one that a password locks";
    if (X509_check_private_key(read.get(), secret.get()) != 1)
        return "the key " + key + " belongs to another certificate";
    int seconds = 0;
    if (ASN1_TIME_diff(&days, &seconds, nullptr, X509_get0_notAfter(read.get())) != 1) return "its end cannot be read";
    return days < 0 || seconds < 0 ? "it has ended, so browsers refuse it" : "";
}

}  // namespace

void checkCertificate(Findings& findings) {
    if (access(VEXO::SystemPath(kSettings).c_str(), F_OK) != 0) {
        findings.push_back({.severity = Severity::kNote,
                            .text = "orvel-web is not set up here, so another web server sees to HTTPS",
                            .file = VEXO::SystemPath(kSettings)});
        return;
    }
    std::string certificate = webSetting("certificate"), key = webSetting("key");
    const bool given = !certificate.empty();
    if (!given) {
        certificate = VEXO::SystemPath(kOwnFolder) + "/certificate.pem";
        key = VEXO::SystemPath(kOwnFolder) + "/key.pem";
    }
    if (key.empty()) key = certificate;
    int days = 0;
    const std::string fault = judge(certificate, key, days);
    ERR_clear_error();
    if (!fault.empty() && geteuid() != 0 && access(key.c_str(), R_OK) != 0) {
        findings.push_back({.severity = Severity::kNote, .text = "only root can look at the key", .file = certificate});
    } else if (!fault.empty()) {
        const char* own = "systemctl restart orvel-web makes one";
        findings.push_back({.severity = Severity::kProblem,
                            .text = fault,
                            .advice = given ? std::string("mend certificate and key in ") + kSettings +
                                                  ", then: systemctl restart orvel-web"
                                            : own,
                            .file = certificate});
    } else {
        const bool soon = days < kSoon;
        findings.push_back({.severity = soon ? Severity::kNote : Severity::kGood,
                            .text = "the certificate fits its key and is valid for " + std::to_string(days) + " days",
                            .advice = soon ? "renew it, then: systemctl reload orvel-web" : "",
                            .file = certificate});
    }
    struct stat status {};
    if (stat(key.c_str(), &status) == 0 && (status.st_mode & (S_IRWXG | S_IRWXO)) != 0) {
        findings.push_back({.severity = Severity::kProblem,
                            .text = "can be read by others than root, and with it anybody can pose as this machine",
                            .advice = "chmod go= " + key,
                            .file = key});
    }
}

}  // namespace orvel::ctl
