// A visitor's request, and the clock of sessions: the uptime stands where the test puts it, and a pause moves it
// instead of waiting.
#ifndef ORVEL_TESTS_SHARING_VISITOR_FIXTURE_H
#define ORVEL_TESTS_SHARING_VISITOR_FIXTURE_H

#include "orvel/login_records.h"
#include "sharing/record_file.h"
#include "support/testing.h"

namespace support {

inline long uptime = 100000;       // what sysinfo tells; negative: it fails
inline unsigned secondsSlept = 0;  // by sleep

class VisitorTest : public ApplianceTest {
 protected:
    void SetUp() override {
        ApplianceTest::SetUp();
        setenv("REMOTE_ADDR", "10.0.0.5", 1);
        makeFolder(systemRoot() + "/tmp", 01777);
        uptime = 100000;
        secondsSlept = 0;
    }
    static std::string path(const char* name) { return systemRoot() + name; }
    static void writeRecords(const std::string& text) { writeFile(path(orvel::kRecordFile), text, 0600); }
    static std::string records() { return readFile(path(orvel::kRecordFile)); }
    // Checks a session of a link as a visitor.
    static int checkSession(const char* session, const char* link, char* user, int size, int flags, int keep = 0,
                            int position = CGI_POSITION_FILE_MANAGER) {
        VEXO::WebCGI cgi;
        _tag_confirm_policy policy = {.flags = flags, .keepAccessTime = keep};
        return IsAuthorizedByPath(&cgi, session, user, size, &policy, static_cast<_tag_cgi_position>(position), link);
    }
};

}  // namespace support

#endif
