// Sessions of visitors: the check that sweeps the record file, the look-up, the adding.
#include <sys/sysinfo.h>

#include "platform/private_mounts.h"
#include "platform/trust.h"
#include "sharing/critical_section.h"
#include "sharing/login_add.h"
#include "sharing/login_record.h"
#include "sharing/visitor_fixture.h"
#include "support/fault_sweep.h"

extern "C" {
int sysinfo(struct sysinfo* info) noexcept {
    *info = {};
    info->uptime = support::uptime;
    if (support::uptime >= 0) return 0;
    errno = EPERM;
    return -1;
}
unsigned sleep(unsigned seconds) {
    support::secondsSlept += seconds;
    support::uptime += seconds;
    return 0;
}
int usleep(useconds_t) {  // the pause after an identifier that cannot be used: the next one comes with the next second
    ++support::uptime;
    return 0;
}
}

namespace {

constexpr int kEverything = ORV_POLICY_ADMINISTRATOR | ORV_POLICY_USER;
const std::string kOther = "10.9.9.9,bob,other,5,99500,1,0,L\n";

class SessionTest : public VisitorTest {
 protected:
    int check(int flags = kEverything, int keep = 0, int position = CGI_POSITION_FILE_MANAGER) {
        user[0] = '\0';
        return checkSession("s1", "L", user, sizeof user, flags, keep, position);
    }
    char user[64] = {};
};

TEST_F(SessionTest, WhatACheckAnswersAndLeavesInTheFile) {
    addUser("gone", 20009, kUsersGid);
    writeRootFile("/etc/shadow", "gone:x:1:0:9:7::7:\n");
    const std::string alice = "10.0.0.5,alice,s1,5,99999,1,0,L\n", aliceNow = "10.0.0.5,alice,s1,5,100000,2,0,L\n";
    const std::string carol = "10.0.0.5,carol,s1,5,99999,1,0,L\n", carolNow = "10.0.0.5,carol,s1,5,100000,2,0,L\n";
    const std::string stale = "10.0.0.5,alice,s1,5,99099,1,0,L\n";
    for (const auto& [what, before, flags, keep, answer, after, name] :
         rowsOf<const char*, std::string, int, int, int, std::string, std::string>("sharing/checks")) {
        SCOPED_TRACE(what);
        writeRecords(before);
        unsetenv("USERNAME");
        EXPECT_EQ(check(flags, keep), answer);
        EXPECT_EQ(records(), after);
        EXPECT_EQ(user, name);
        EXPECT_EQ(getenv("USERNAME") == nullptr ? "" : getenv("USERNAME"), name);
        EXPECT_FALSE(fs::exists(path(orvel::kRecordTemporary)));
    }
}

TEST_F(SessionTest, ApplicationsOfThePositions) {
    writeRootFile("/etc/vexo/applications",
                  "VEXO.QDS.App.Quorvane3.Instance: bob\nVEXO.QDS.Tunehall.Application: bob\nVEXO.QDS.Watchpost: bob\n"
                  "VEXO.QDS.Fetchyard.Application: bob\n");
    const std::string alice = "10.0.0.5,alice,s1,5,99999,1,0,L\n", bob = "10.0.0.5,bob,s1,5,99999,1,0,L\n";
    for (int position = 0; position <= 6; ++position) {
        SCOPED_TRACE(position);
        const bool asks = position >= 2 && position <= 5;
        writeRecords(bob + alice);
        EXPECT_EQ(check(kEverything, 0, position), asks ? -2 : 1) << "the refused match takes the earlier answer back";
        const std::string end = ",s1,5,100000," + std::to_string(position) + ",0,L\n";
        EXPECT_EQ(records(), "10.0.0.5,bob" + end + (asks ? "" : "10.0.0.5,alice" + end));
    }
}

TEST_F(SessionTest, TheAddressOfTheClient) {
    const char* const kNone = nullptr;
    const std::string longText(60, '7');
    for (const auto& [forwarded, client, remote, recorded] : Rows<const char*, const char*, const char*, std::string>{
             row("10.0.0.5, 192.168.1.2", "10.0.0.6", "10.0.0.7", "10.0.0.5"),
             row(kNone, "10.0.0.6", "10.0.0.7", "10.0.0.6"), row(kNone, kNone, "10.0.0.7", "10.0.0.7"),
             row(longText.c_str(), kNone, kNone, longText.substr(0, 45))}) {
        for (const auto& [name, value] :
             {std::pair{"HTTP_X_FORWARDED_FOR", forwarded}, {"HTTP_CLIENT_IP", client}, {"REMOTE_ADDR", remote}})
            value == nullptr ? unsetenv(name) : setenv(name, value, 1);
        writeRecords(recorded + ",alice,s1,5,99999,1,0,L\n");
        EXPECT_EQ(check(), 1) << recorded;
    }
    setenv("HTTP_X_FORWARDED_FOR", "10.0.0.99", 1);
    for (const char* skip : {"yes please, whoever asks", "YES", "yes"}) {
        setSetting("skip_checksrcip", skip);
        EXPECT_EQ(check(), std::string(skip) == "yes" ? 1 : -2) << skip;
    }
}

TEST_F(SessionTest, RefusedBeforeAnyRecordIsRead) {
    VEXO::WebCGI cgi;
    _tag_confirm_policy policy = {.flags = 3, .keepAccessTime = 0};
    const auto position = CGI_POSITION_FILE_MANAGER;
    EXPECT_EQ(IsAuthorizedByPath(nullptr, "s1", user, 64, &policy, position, "L"), -4);
    EXPECT_EQ(IsAuthorizedByPath(&cgi, "s1", nullptr, 64, &policy, position, "L"), -4);
    EXPECT_EQ(IsAuthorizedByPath(&cgi, "s1", user, 0, &policy, position, "L"), -4);
    EXPECT_EQ(IsAuthorizedByPath(&cgi, "s1", user, 64, nullptr, position, "L"), -4);
    VLIBCErrSetEx(0, "", 0);
    EXPECT_EQ(check(), -2) << "without a file";
    EXPECT_EQ(VLIBCErrGet(), VEXO_ERR_FILE);
    writeRecords(kOther);
    EXPECT_EQ(IsAuthorizedByPath(&cgi, nullptr, user, 64, &policy, position, nullptr), -2);
    announceLog("VexoCgiBeginCriticalSection Failed.");
    vexo::gate::fail("VexoCgiBeginCriticalSection", VEXO_ERR_GENERAL, ETIMEDOUT, 1);
    EXPECT_EQ(check(), -2);
    announceLog("sysinfo Failed, reason=Operation not permitted");
    uptime = -1;
    EXPECT_EQ(check(), -2);
    unsetenv("REMOTE_ADDR");
    EXPECT_EQ(check(), -4);
    EXPECT_EQ(records(), kOther);
}

TEST_F(SessionTest, PlantedFiles) {
    const std::string record = path(orvel::kRecordFile), temporary = path(orvel::kRecordTemporary);
    const std::string good = "10.0.0.5,alice,s1,5,99999,1,0,L\n";
    const auto refused = [&] {
        std::string session;
        EXPECT_EQ(check(), -2);
        EXPECT_FALSE(orvel::addLoginRecord("alice", session, 0, "L"));
    };
    plantEach(record, refused, good);
    writeRecords(good);
    const auto replaced = [&] {
        const bool isFolder = fs::is_directory(temporary);
        if (isFolder) announceLog("file open error, reason=Is a directory");
        EXPECT_EQ(check(), isFolder ? -4 : 1);
        const struct stat status = statusOf(record);
        EXPECT_TRUE(S_ISREG(status.st_mode) && (status.st_mode & 07777) == 0600 && status.st_nlink == 1);
    };
    plantEach(temporary, replaced, good);
    const auto shut = [&] {
        announceLog("VexoCgiBeginCriticalSection Failed.");
        EXPECT_EQ(check(), -2);
    };
    plantEach(path(orvel::kRecordLock), shut, good);
}

TEST_F(SessionTest, ManyAtOnceLoseNothing) {
    constexpr int kProcesses = 16, kRounds = 20, kSessions = 200;
    std::string before;
    for (int i = 0; i < kSessions; ++i) before += "10.0.0.5,alice,s" + std::to_string(i) + ",99000,99500,1,0,L\n";
    writeRecords(before);
    const auto visits = [] {
        for (int round = 0; round < kRounds; ++round) {
            const std::string visitor = std::to_string(getpid()) + "n" + std::to_string(round);
            const std::string session = "s" + std::to_string(round * 7);
            std::string added;
            char name[64] = {}, link[] = "L";
            _tag_VexoCgi request = {orvel::kRecordLock, orvel::kRecordFile, {{"id", session}}};
            if (!orvel::addLoginRecord(visitor.c_str(), added, 0, visitor.c_str()) ||
                checkSession(session.c_str(), link, name, sizeof name, kEverything) != 1 ||
                VexoCgiHasRecord(&request, name, sizeof name, link) != 1) {
                return false;
            }
        }
        return true;
    };
    EXPECT_EQ(countAtOnce(kProcesses, visits), kProcesses);
    const std::string after = records();
    EXPECT_EQ(std::count(after.begin(), after.end(), '\n'), kSessions + kProcesses * kRounds);
    std::string whole;
    std::string_view rest = after;
    for (orvel::LoginRecord record; orvel::nextLoginRecord(rest, orvel::kLongestCheckedLine, record);)
        orvel::appendLoginRecord(record, whole);
    EXPECT_EQ(whole, after) << "a line is torn";
}

TEST_F(SessionTest, NoFaultLosesARecord) {
    // Two records and a user's share of questions: whatever fails, the other session stays and no temporary is left.
    sweepFaults(VEXO_ERR_GENERAL, [&](int nth) {
        const std::string before = "10.0.0.5,alice,s1,5,99999,1,0,L\n" + kOther;
        writeRecords(before);
        const int answer = check();
        EXPECT_EQ(answer == 1 || nth != 0, true);
        if (answer == -4) {
            EXPECT_EQ(records(), before);
        }
        EXPECT_TRUE(records().ends_with(kOther));
        EXPECT_FALSE(fs::exists(path(orvel::kRecordTemporary)));
    });
}

TEST_F(SessionTest, Adding) {
    std::string first, second;
    ASSERT_TRUE(orvel::addLoginRecord("alice", first, 0, "L"));
    EXPECT_EQ(secondsSlept, 1U) << "also without a file";
    const std::string drawn = std::to_string(uptime - 1);
    EXPECT_EQ(records(), "10.0.0.5,alice," + first + "," + drawn + "," + drawn + ",1,0,L\n");
    EXPECT_STREQ(getenv("USERNAME"), "alice");
    uptime = 100000;  // the same second once more gives the same identifier: another one is drawn
    fs::permissions(path(orvel::kRecordFile), fs::perms(0644));
    ASSERT_TRUE(orvel::addLoginRecord("alice", second, 7, nullptr));
    EXPECT_EQ(secondsSlept, 3U);
    EXPECT_NE(first, second);
    EXPECT_TRUE(records().ends_with(",1,7,\n"));
    EXPECT_EQ(first.size(), 13U);
    EXPECT_EQ((first + second).find_first_of("/:,"), std::string::npos);
    EXPECT_EQ(fs::status(path(orvel::kRecordFile)).permissions(), fs::perms(0600));

    const std::string before = records();
    const std::string longLink(500, 'x');
    for (const auto& [name, address, link] : Rows<const char*, const char*, const char*>{
             row(static_cast<const char*>(nullptr), "10.0.0.5", "L"), row("", "10.0.0.5", "L"),
             row("a,b", "10.0.0.5", "L"), row("a\nb", "10.0.0.5", "L"), row("carol", "", "L"),
             row("carol", "10.0.0.5\r", "L"), row("carol", "10.0.0.5", "L,0"),
             row("carol", "10.0.0.5", longLink.c_str())}) {
        setenv("REMOTE_ADDR", address, 1);
        announceLog(link == longLink ? ") VLIBCFileAddLine Failed." : ") Bad parameter.");
        EXPECT_FALSE(orvel::addLoginRecord(name, first, 0, link));
    }
    setenv("REMOTE_ADDR", "10.0.0.5", 1);
    vexo::gate::fail("VLIBCFileGetLine", VEXO_ERR_GENERAL, EIO, 1);
    EXPECT_FALSE(orvel::addLoginRecord("carol", first, 0, "L"));
    announceLog("VexoCgiBeginCriticalSection Failed.");
    vexo::gate::fail("VexoCgiBeginCriticalSection", VEXO_ERR_GENERAL, ETIMEDOUT, 1);
    EXPECT_FALSE(orvel::addLoginRecord("carol", first, 0, "L"));
    EXPECT_EQ(records(), before);
}

TEST_F(SessionTest, LookingUpASession) {
    writeRecords("torn\n1.2.3.4,bob,s1,1,1,1,0,K\n1.2.3.4,alice,s1,1,1,1,0,L\n1.2.3.4,carol,s1,1,1,1,0,L\n");
    _tag_VexoCgi request = {orvel::kRecordLock, orvel::kRecordFile, {{"L", "s2"}, {"id", "s1"}}};
    char link[] = "L", name[4] = "???";
    EXPECT_EQ(VexoCgiHasRecord(&request, name, sizeof name, link), 1);
    EXPECT_STREQ(name, "ali");
    EXPECT_EQ(VexoCgiHasRecord(&request, name, 0, link), 0);
    request.cookies[1].second = "s2";
    EXPECT_EQ(VexoCgiHasRecord(&request, name, sizeof name, link), 0);
    request.cookies.pop_back();
    EXPECT_EQ(VexoCgiHasRecord(&request, name, sizeof name, link), 0) << "the link's own cookie does not count";
    EXPECT_EQ(VexoCgiHasRecord(nullptr, name, sizeof name, link), 0);
    request = {orvel::kRecordLock, "/tmp/none", {{"id", "s1"}}};
    EXPECT_EQ(VexoCgiHasRecord(&request, name, sizeof name, link), 0);
    announceLog("VexoCgiBeginCriticalSection Failed.");
    request.szLockFile = "/missing/lock";
    EXPECT_EQ(VexoCgiHasRecord(&request, name, sizeof name, link), 0);
    EXPECT_STREQ(name, "ali");
}

TEST_F(SessionTest, AFullDiskKeepsTheOldFile) {
    EXPECT_WITH_PRIVATE_MOUNTS(inPrivateMounts([&] {
        const std::string folder = path("/tmp");
        if (mount("none", folder.c_str(), "tmpfs", 0, "size=64k,mode=1777") != 0) return kNoPrivateMounts;
        std::string before = "10.0.0.5,alice,s1,5,99999,1,0,L\n";
        while (before.size() < 4096 - 100) before += kOther;
        const std::string head = "1.2.3.4,", tail = ",x,5,99999,1,7,L\n";
        before += head + std::string(4096 - before.size() - head.size() - tail.size(), 'u') + tail;
        writeRecords(before);  // fills its page to the end
        { const orvel::CriticalSection section(orvel::kRecordLock); }
        writeFile(folder + "/rest", std::string(64 << 10, 'x'));
        EXPECT_EQ(check(), -4);
        EXPECT_EQ(records(), before);
        EXPECT_FALSE(fs::exists(path(orvel::kRecordTemporary)));
        announceLog("VLIBCFileAddLine Failed.");
        std::string session;
        EXPECT_FALSE(orvel::addLoginRecord("bob", session, 0, "L"));
        EXPECT_EQ(records(), before);
        fs::remove(folder + "/rest");
        EXPECT_EQ(check(), 1);
        return 0;
    }));
}

}  // namespace
