// Sessions of visitors: the check that sweeps the record file, the look-up, the adding.
#include <sys/sysinfo.h>

#include "platform/private_mounts.h"
#include "sharing/critical_section.h"
#include "sharing/login_add.h"
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
         Rows<const char*, std::string, int, int, int, std::string, std::string>{
             row("a user", alice + kOther, 3, 0, 1, aliceNow + kOther, "alice"),
             row("an administrator", carol, 3, 0, 2, carolNow, "carol"),
             row("an administrator as a user", carol, 2, 0, 1, carolNow, "carol"),
             row("a user where only administrators count", alice, 1, 0, -2, aliceNow, "alice"),
             row("the time of access kept", alice, 3, 1, 1, "10.0.0.5,alice,s1,5,99999,2,0,L\n", "alice"),
             row("just fresh", "10.0.0.5,alice,s1,5,99100,1,0,L\n", 3, 0, 1, aliceNow, "alice"),
             row("just stale", stale + kOther, 3, 0, -1, kOther, "alice"),
             row("stale, but kept", stale, 3, 1, -1, "10.0.0.5,alice,s1,5,99099,2,0,L\n", "alice"),
             row("never stale", "10.0.0.5,alice,s1,5,1,1,7,L\n", 3, 0, 1, "10.0.0.5,alice,s1,5,100000,2,7,L\n",
                 "alice"),
             row("of others: stale, fresh, never stale", "a,u,x,5,99099,1,0,L\na,u,x,5,99100,1,0,K\na,u,x,5,0,1,1,M\n",
                 3, 0, -2, "a,u,x,5,99100,1,0,K\na,u,x,5,0,1,1,M\n", ""),
             row("another link", "10.0.0.5,alice,s1,5,99999,1,0,K\n", 3, 0, -2, "10.0.0.5,alice,s1,5,99999,1,0,K\n",
                 ""),
             row("another address, stale", "10.0.0.6,alice,s1,5,99099,1,0,L\n" + kOther, 3, 1, -2, kOther, ""),
             row("a deleted user", "10.0.0.5,zed,s1,5,99999,1,0,L\n" + kOther, 3, 0, -2, kOther, "zed"),
             row("an account that ended", "10.0.0.5,gone,s1,5,99999,1,0,L\n", 3, 0, -2, "", "gone"),
             row("the last match decides", carol + alice, 3, 0, 1, carolNow + aliceNow, "alice"),
             row("a deleted user decides nothing", alice + "10.0.0.5,zed,s1,5,99999,1,0,L\n", 3, 0, 1, aliceNow, "zed"),
             row("no records in between", "torn,li\n" + alice + std::string("\0\1\xFF\n", 4) + kOther + "10.0.0.5,al",
                 3, 0, 1, aliceNow + kOther, "alice"),
             row("an empty file", "", 3, 0, -2, "", "")}) {
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
             {std::pair{"HTTP_X_FORWARDED_FOR", forwarded}, {"HTTP_CLIENT_IP", client}, {"REMOTE_ADDR", remote}}) {
            value == nullptr ? unsetenv(name) : setenv(name, value, 1);
        }
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
    const std::string record = path(orvel::kRecordFile), temporary = path(orvel::kRecordTemporary),
                      lock = path(orvel::kRecordLock);
    const std::string victim = path("/etc/victim"), good = "10.0.0.5,alice,s1,5,99999,1,0,L\n";
    writeFile(victim, good);
    const auto plants = std::vector<std::pair<const char*, std::function<void(const std::string&)>>>{
        {"link", [&](const std::string& at) { fs::create_symlink(victim, at); }},
        {"second name", [&](const std::string& at) { fs::create_hard_link(victim, at); }},
        {"pipe", [](const std::string& at) { mkfifo(at.c_str(), 0666); }},
        {"folder", [](const std::string& at) { fs::create_directory(at); }},
        {"writable by the group", [&](const std::string& at) { writeFile(at, good, 0620); }},
        {"writable by others", [&](const std::string& at) { writeFile(at, good, 0602); }},
        {"another's",
         [&](const std::string& at) {
             writeFile(at, good, 0600);
             if (chown(at.c_str(), kBobUid, kUsersGid) != 0) chmod(at.c_str(), 0666);
         }},
    };
    for (const auto& [what, plant] : plants) {
        SCOPED_TRACE(what);
        plant(record);
        EXPECT_EQ(check(), -2);
        std::string session;
        EXPECT_FALSE(orvel::addLoginRecord("alice", session, 0, "L"));
        const bool isFolder = fs::is_directory(record);
        fs::remove(record);
        writeRecords(good);
        plant(temporary);
        if (isFolder) announceLog("file open error, reason=Is a directory");
        EXPECT_EQ(check(), isFolder ? -4 : 1);
        const struct stat status = statusOf(record);
        EXPECT_TRUE(S_ISREG(status.st_mode) && (status.st_mode & 07777) == 0600 && status.st_nlink == 1);
        fs::remove(lock);
        plant(lock);
        announceLog("VexoCgiBeginCriticalSection Failed.");
        EXPECT_EQ(check(), -2);
        EXPECT_EQ(readFile(victim), good);
        for (const std::string& planted : {record, temporary, lock}) fs::remove(planted);
    }
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
