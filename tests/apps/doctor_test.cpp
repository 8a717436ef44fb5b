// What the doctor says of an appliance in which one thing is not as it should be.
#include <json/reader.h>

#include "apps/orveld.h"
#include "support/testing.h"

namespace {

constexpr const char* kOpenssl =
    "openssl req -x509 -newkey ec -pkeyopt ec_paramgen_curve:prime256v1 -nodes -subj /CN=x ";

class Doctor : public ApplianceTest {
 protected:
    void TearDown() override {
        for (const char* made :
             {"/etc/pam.d", "/etc/orvel", "/etc/fstab", "/etc/vexo/ddns.conf", "/var/lib/orvel-web"}) {
            fs::remove_all(systemRoot() + made);
        }
        ApplianceTest::TearDown();
    }
    // "severity|text" of each finding of a check.
    static std::string say(const std::string& check) {
        const support::Finished finished = support::runProgram({ORVELCTL, "doctor", check, "--json"});
        Json::Value report;
        EXPECT_TRUE(Json::Reader().parse(finished.output, report)) << finished.output;
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
    const std::string cert = kOpenssl + std::string("-days 300 -keyout key -out crt && chmod 600 key");
    const std::string web = "mkdir -p etc/orvel var/lib/orvel-web; : >etc/orvel/web.conf; cd var/lib/orvel-web; ";
    const std::string own = web + "" + cert + "; mv crt certificate.pem; mv key key.pem";
    const struct {
        const char* check;
        std::string breaks;  // after what the rows before it did
        const char* severity;
        const char* text;
    } rows[] = {
        {"files", "chmod 644 etc/vexoinfo.conf", "good", "are as they should be"},
        {"files", "chmod 666 etc/vexoinfo.conf", "problem", "can be changed by others"},
        {"files", "chmod 640 etc/vexoinfo.conf", "problem", "cannot be read by users"},
        {"files", "chmod 644 etc/vexoinfo.conf; chown 30001 etc/vexoinfo.conf", "problem", "belongs to uid 30001"},
        {"files", "chown 0 etc/vexoinfo.conf; mkdir -p run/vexo/sessions; chmod 755 run/vexo/sessions", "problem",
         "can be read by others"},
        {"files", "chmod 700 run/vexo/sessions; mkdir -p etc/vexo/ddns.conf", "problem", "is not a file"},
        {"log-in", "true", "note", "not the machine's own"},
        {"log-in",
         "mkdir -p etc/pam.d; printf 'auth required pam_unix.so\\naccount [default=ignore a=b] pam_unix.so\\n' "
         ">etc/pam.d/orvel",
         "good", "are there"},
        {"log-in", "echo 'auth required pam_of_nobody.so' >>etc/pam.d/orvel", "problem",
         "the module pam_of_nobody.so is not installed"},
        {"log-in", "echo '@include common-nothing' >etc/pam.d/orvel", "problem",
         "includes common-nothing, which is not there"},
        {"log-in", "echo 'auth include orvel' >etc/pam.d/orvel", "problem", "has no line of the kind account"},
        {"log-in", "chmod 666 etc/pam.d/orvel", "problem", "can be changed by others than root"},
        {"certificate", "true", "note", "is not set up here"},
        {"certificate", web + "true", "problem", "the certificate cannot be read"},
        {"certificate", own, "good", "fits its key and is valid for"},
        {"certificate", "chmod 644 var/lib/orvel-web/key.pem", "problem", "anybody can pose"},
        {"certificate", "cd var/lib/orvel-web; mv key.pem old; " + cert + "; cp key key.pem", "problem",
         "belongs to another certificate"},
        {"certificate", "cd var/lib/orvel-web; cp crt certificate.pem; rm key.pem", "problem", "cannot be read"},
        {"certificate", "echo x >var/lib/orvel-web/certificate.pem", "problem", "no certificate in PEM form"},
        {"certificate",
         "cd var/lib/orvel-web; cat key crt >both.pem; chmod 600 both.pem; echo certificate=$PWD/both.pem "
         ">../../../etc/orvel/web.conf",
         "good", "fits its key"},
        {"certificate",
         "cd var/lib/orvel-web; " + std::string(kOpenssl) + "-days 3 -keyout both.pem -out c && cat c >>both.pem",
         "note", "is valid for"},
        {"orveld", "true", "problem", "orveld does not answer"},
        {"orveld", "echo 'orveld_web_servers=\"root, nobody-of-this-name\"' >>etc/vexoinfo.conf", "problem",
         "names nobody-of-this-name, who is no user here"},
        {"sweep", "true", "problem", "nothing was ever swept"},
        {"sweep", std::string(ORVELCTL) + " sweep", "good", "swept 0 minutes ago"},
        {"sweep", "echo 'recycle_days=\"a week\"' >>etc/vexoinfo.conf", "problem", "recycle_days is no number"},
        {"sweep", "sed -i 's/time=.*/time=\"1000\"/' var/lib/vexo/sweep", "problem", "days ago"},
        {"indexes", "true", "good", "no share has an index"},
        {"shares",
         "mkdir -p users pub; chmod 1770 users; printf \"#VERSION "
         "2\\npath=$PWD/pub\\ncomment=\\nusershare_acl=S-1-1-0:F"
         "\\nguest_ok=n\\n\" >users/pub; chown 20001 users/pub pub; printf '[global]\\nusershare path = /users\\n' "
         ">etc/vexo/shares.conf",
         "good", ", which the user alice shares"},
        {"shares", "chown 20002 pub", "problem", "belongs to another user"},
        {"shares", "chmod 1777 users", "problem", "in which not everybody may write"},
        {"shares", "rm etc/vexo/shares.conf; rm -r users pub", "problem", "there are no share definitions"},
        {"volumes", "! " ORVELCTL " volumes 2>said; grep -q 'doctor shares' said; rm said", "note", ""},
    };
    for (const auto& row : rows) {
        shell(row.breaks);
        expect(row.check, row.severity, row.text);
    }
}

TEST_F(Doctor, LooksAtMountsAndIndexes) {
    SKIP_WITHOUT_ROOT();
    const std::string photo = shareRoot("photo");
    writeRootFile("/etc/vexo/shares.conf", "[photo]\npath = " + photo + "\nvexo:index = yes\n");
    expect("indexes", "problem", "[photo] has no index");
    EXPECT_EQ(support::runProgram({ORVELCTL, "index", "build", "photo"}).status, 0);
    expect("indexes", "good", "entries, updated 0 minutes ago");
    expect("mounts", "good", "which holds files without a name");
    writeRootFile("/etc/fstab", "/dev/none " + photo + " ext4 defaults 0 0\n");
    expect("mounts", "problem", "which is not mounted");
    addMount(photo, "ext4", "ro");
    expect("mounts", "note", "on a read-only mount");
    EXPECT_EQ(support::runProgram({ORVELCTL, "doctor", "kernel"}).status, 0);
    EXPECT_EQ(support::runProgram({ORVELCTL, "doctor", "nonsense"}).status, 2);
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
