// What the doctor says of an appliance in which one thing is not as it should be.

#include "apps/orveld.h"
#include "support/testing.h"

namespace {

class Doctor : public ApplianceTest {
 protected:
    // "severity|text" of each finding of a check.
    static std::string say(const std::string& check) {
        const support::Finished finished = support::orvelctl({"doctor", check, "--json"});
        const Json::Value report = support::jsonOf(finished.output);
        EXPECT_EQ(finished.status, report["problems"].asInt() == 0 ? 0 : 1) << finished.output;
        std::string all;
        for (const Json::Value& finding : report["findings"]) {
            const std::string severity = finding["severity"].asString();
            EXPECT_TRUE(severity != "problem" || !finding["advice"].asString().empty()) << finished.output;
            all += severity + "|" + finding["text"].asString() + "\n";
        }
        return all;
    }
    static void expect(const std::string& check, const std::string& severity, const std::string& text) {
        const std::string said = say(check);
        const bool found = said.find(severity + "|") != std::string::npos && said.find(text) != std::string::npos;
        EXPECT_TRUE(found) << check << ": wanted " << severity << "|" << text << ", got\n" << said;
    }
    static void shell(const std::string& command) {
        EXPECT_EQ(
            support::runProgram({"/bin/sh", "-c", "cd " + systemRoot() + "; { " + command + "; } 2>/dev/null"}).status,
            0)
            << command;
    }
};

TEST_F(Doctor, NamesWhatIsWrong) {
    SKIP_WITHOUT_ROOT();
    const std::string own = "mkdir -p etc/orvel var/lib/orvel-web; : >etc/orvel/web.conf; cd var/lib/orvel-web; ";
    const std::string openssl =
        "openssl req -x509 -newkey ec -pkeyopt ec_paramgen_curve:prime256v1 -nodes -subj /CN=x ";
    const std::string cert = openssl + "-days 300 -keyout key -out crt && chmod 600 key";
    const std::map<std::string, std::string> words = {
        {"{openssl}", openssl},
        {"{orvelctl}", ORVELCTL},
        {"{cert}", cert},
        {"{web}", own},
        {"{own}", own + cert + "; mv crt certificate.pem; mv key key.pem"}};
    // Each breaks something after what the rows before it did.
    for (auto [check, breaks, severity, text] :
         rowsOf<std::string, std::string, std::string, std::string>("apps/doctor")) {
        for (const auto& [word, meaning] : words) {
            const size_t at = breaks.find(word);
            if (at != std::string::npos) breaks.replace(at, word.size(), meaning);
        }
        shell(breaks);
        expect(check, severity, text);
    }
}

TEST_F(Doctor, LooksAtMountsAndIndexes) {
    SKIP_WITHOUT_ROOT();
    const std::string photo = shareRoot("photo");
    writeRootFile("/etc/vexo/shares.conf", "[photo]\npath = " + photo + "\nvexo:index = yes\n");
    expect("indexes", "problem", "[photo] has no index");
    EXPECT_EQ(support::orvelctl({"index", "build", "photo"}).status, 0);
    expect("indexes", "good", "entries, updated 0 minutes ago");
    expect("mounts", "good", "which holds files without a name");
    writeRootFile("/etc/fstab", "/dev/none " + photo + " ext4 defaults 0 0\n");
    expect("mounts", "problem", "which is not mounted");
    addMount(photo, "ext4", "ro");
    expect("mounts", "note", "on a read-only mount");
    EXPECT_EQ(support::orvelctl({"doctor", "kernel"}).status, 0);
    EXPECT_EQ(support::orvelctl({"doctor", "nonsense"}).status, 2);
}

TEST_F(Doctor, HearsOrveld) {
    // A share of a user's, which is read before orveld looks at what it has open; with the mounts of the machine
    // itself.
    shell(
        "rm -f proc/mounts; mkdir -p users pub; chmod 1770 users; printf '[global]\\nusershare path = /users\\n' "
        ">>etc/vexo/shares.conf; "
        "printf \"#VERSION 2\\npath=$PWD/pub\\ncomment=\\nusershare_acl=S-1-1-0:F\\nguest_ok=n\\n\" >users/pub");
    const Orveld orveld;
    setSetting("orveld_socket", orveld.socket());
    expect("orveld", "good", "orveld answers");
    expect("shares", "good", "shares");
}

}  // namespace
