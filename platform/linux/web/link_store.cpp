#include "vexo/link_store.h"

#include <array>
#include <ctime>

#include "base/raised_identity.h"
#include "base/random.h"
#include "fault_gate.h"
#include "link_database.h"

namespace VEXO {
namespace {

constexpr size_t kIdBytes = 16;
constexpr std::int64_t kTogether = 3600;         // seconds in which the parts of a file count as one download
constexpr const char* kMostRemembered = "1000";  // downloads of a link whose parts count as one

constexpr const char* kInsert =
    "INSERT INTO sharingLinks(linkID, owner, uid, filepath, filename, password, AvailDate, ExpDate, created) "
    "VALUES(?,?,?,?,?,?,?,?,?)";
constexpr const char* kSelect =
    "SELECT s.linkID, owner, uid, filepath, password, AvailDate, ExpDate, created, note, most, used, lastUse "
    "FROM sharingLinks s LEFT JOIN linkMore m ON m.linkID = s.linkID ";
constexpr const char* kInsertReceiving =
    "INSERT INTO uploadLinks(linkID, owner, uid, filepath, password, AvailDate, ExpDate, created, folder, mostFiles, "
    "mostBytes) VALUES(?,?,?,?,?,?,?,?,?,?,?)";
constexpr const char* kSelectReceiving =
    "SELECT s.linkID, owner, uid, filepath, password, AvailDate, ExpDate, created, note, most, used, lastUse, folder, "
    "mostFiles, mostBytes, files, bytes FROM uploadLinks s LEFT JOIN linkMore m ON m.linkID = s.linkID ";
constexpr const char* kUpdateReceiving =
    "UPDATE uploadLinks SET password = ?2, AvailDate = ?3, ExpDate = ?4, mostFiles = ?5, mostBytes = ?6 WHERE linkID = "
    "?1";
constexpr const char* kDeleteReceiving = "DELETE FROM uploadLinks WHERE linkID = ?1 AND (?2 = '' OR owner = ?2)";
constexpr const char* kReceived = "UPDATE uploadLinks SET files = files + 1, bytes = bytes + ?2 WHERE linkID = ?1";
constexpr const char* kUsedNow = "UPDATE linkMore SET lastUse = ?2 WHERE linkID = ?1";
constexpr const char* kNoteSent = "INSERT INTO sentFiles(linkID, at, address, name, size) VALUES(?,?,?,?,?)";
constexpr const char* kSelectSent =
    "SELECT name, address, size, at FROM sentFiles WHERE linkID = ?1 AND EXISTS(SELECT 1 FROM uploadLinks WHERE linkID "
    "= ?1 AND owner = ?2) ORDER BY rowid DESC LIMIT ?4 OFFSET ?3";
constexpr std::array<const char*, 3> kDeleteBeside = {"DELETE FROM linkMore WHERE linkID = ?",
                                                      "DELETE FROM linkTaken WHERE linkID = ?",
                                                      "DELETE FROM sentFiles WHERE linkID = ?"};
constexpr const char* kUpdate = "UPDATE sharingLinks SET password = ?2, AvailDate = ?3, ExpDate = ?4 WHERE linkID = ?1";
constexpr const char* kInsertMore = "INSERT OR IGNORE INTO linkMore(linkID) VALUES(?)";
constexpr const char* kUpdateMore = "UPDATE linkMore SET note = ?2, most = ?3 WHERE linkID = ?1";
constexpr const char* kDelete = "DELETE FROM sharingLinks WHERE linkID = ?1 AND (?2 = '' OR owner = ?2)";

constexpr const char* kIsPart = "SELECT 1 FROM linkTaken WHERE linkID = ? AND who = ? AND what = ? AND at > ?";
constexpr const char* kCount =
    "UPDATE linkMore SET used = used + 1, lastUse = ?2 WHERE linkID = ?1 AND (most = 0 OR used < most)";
constexpr const char* kRemember = "INSERT OR REPLACE INTO linkTaken(linkID, who, what, at) VALUES(?,?,?,?)";
constexpr const char* kForget =
    "DELETE FROM linkTaken WHERE linkID = ?1 AND (at <= ?2 OR rowid NOT IN "
    "(SELECT rowid FROM linkTaken WHERE linkID = ?1 ORDER BY at DESC LIMIT ?3))";

Link linkOf(const vexo::Statement& row) {
    Link link = {.id = vexo::textOf(row, 0),
                 .owner = vexo::textOf(row, 1),
                 .uid = static_cast<uid_t>(vexo::numberOf(row, 2)),
                 .path = vexo::textOf(row, 3),
                 .passwordHash = vexo::textOf(row, 4),
                 .available = vexo::numberOf(row, 5),
                 .expires = vexo::numberOf(row, 6),
                 .created = vexo::numberOf(row, 7),
                 .note = vexo::textOf(row, 8),
                 .most = vexo::numberOf(row, 9),
                 .used = vexo::numberOf(row, 10),
                 .lastUse = vexo::numberOf(row, 11)};
    link.receives = sqlite3_column_count(row.get()) > 12;
    if (!link.receives) return link;
    link.folder = vexo::textOf(row, 12);
    link.mostFiles = vexo::numberOf(row, 13);
    link.mostBytes = vexo::numberOf(row, 14);
    link.files = vexo::numberOf(row, 15);
    link.bytes = vexo::numberOf(row, 16);
    return link;
}

}  // namespace

struct LinkStore::Impl {
    vexo::LinkDatabase database;
    std::optional<vexo::LinkTransaction> receiving;

    bool run(const char* sql, const std::vector<std::string>& values) { return database.run(sql, values); }
    bool select(const std::string& where, const std::string& value, std::vector<Link>& links) {
        const auto take = [&links](const vexo::Statement& row) { links.push_back(linkOf(row)); };
        return database.run((kSelect + where).c_str(), {value}, take) &&
               database.run((kSelectReceiving + where).c_str(), {value}, take);
    }
    bool insert(const Link& link) {
        std::vector<std::string> values = {link.id, link.owner, std::to_string(link.uid), link.path};
        if (!link.receives) values.push_back(link.path.substr(link.path.rfind('/') + 1));
        for (const std::string& value : {link.passwordHash, std::to_string(link.available),
                                         std::to_string(link.expires), std::to_string(link.created)}) {
            values.push_back(value);
        }
        if (!link.receives) return run(kInsert, values);
        for (const std::string& value : {link.folder, std::to_string(link.mostFiles), std::to_string(link.mostBytes)}) {
            values.push_back(value);
        }
        return run(kInsertReceiving, values);
    }
    bool update(const Link& link) {
        std::vector<std::string> values = {link.id, link.passwordHash, std::to_string(link.available),
                                           std::to_string(link.expires)};
        if (!link.receives) return run(kUpdate, values);
        values.push_back(std::to_string(link.mostFiles));
        values.push_back(std::to_string(link.mostBytes));
        return run(kUpdateReceiving, values);
    }
    // What a link has beside its row.
    bool keepMore(const Link& link) {
        return run(kInsertMore, {link.id}) && run(kUpdateMore, {link.id, link.note, std::to_string(link.most)});
    }
    // Whether that visitor's download of it was counted lately.
    bool isPart(const std::string& id, const std::string& who, const std::string& what, bool& part) {
        part = false;
        return database.run(kIsPart, {id, who, what, std::to_string(time(nullptr) - kTogether)},
                            [&part](const vexo::Statement&) { part = true; });
    }
    bool count(const std::string& id, const std::string& who, const std::string& what, LinkTaking& taking) {
        const std::int64_t now = time(nullptr);
        if (!run(kInsertMore, {id}) || !run(kCount, {id, std::to_string(now)})) return false;
        taking = database.changed() == 1 ? LinkTaking::kTaken : LinkTaking::kUsedUp;
        if (taking == LinkTaking::kUsedUp) return true;
        return run(kRemember, {id, who, what, std::to_string(now)}) &&
               run(kForget, {id, std::to_string(now - kTogether), kMostRemembered});
    }
};

LinkStore::LinkStore() : impl_(std::make_unique<Impl>()) {}

LinkStore::~LinkStore() {
    const orvel::RaisedIdentity raised;
    impl_->receiving.reset();
    impl_->database.close();
}

const std::string& LinkStore::error() const {
    return impl_->database.error();
}

bool LinkStore::add(Link& link) {
    VEXO_GATE("LinkStore::add", impl_->database.fail());
    const orvel::RaisedIdentity raised;
    if (!impl_->database.openForAdding()) return false;
    link.id = orvel::draw<kIdBytes>();
    link.created = time(nullptr);
    if (link.id.empty()) return impl_->database.fail();
    vexo::LinkTransaction transaction(impl_->database);
    return transaction.begun() && impl_->insert(link) && impl_->keepMore(link) && transaction.commit();
}

bool LinkStore::find(const std::string& id, std::optional<Link>& link) {
    VEXO_GATE("LinkStore::find", impl_->database.fail());
    const orvel::RaisedIdentity raised;
    std::vector<Link> links;
    bool there = false;
    link.reset();
    if (!impl_->database.open(there)) return false;
    if (there && !impl_->select("WHERE s.linkID = ?", id, links)) return false;
    if (!links.empty()) link = links.front();
    return true;
}

bool LinkStore::list(const std::string& owner, std::vector<Link>& links) {
    VEXO_GATE("LinkStore::list", impl_->database.fail());
    const orvel::RaisedIdentity raised;
    bool there = false;
    if (!impl_->database.open(there)) return false;
    return !there || impl_->select("WHERE ?1 = '' OR owner = ?1 ORDER BY s.rowid", owner, links);
}

bool LinkStore::change(const std::string& id, const std::string& owner, const std::function<bool(Link&)>& edit,
                       std::optional<Link>& link) {
    VEXO_GATE("LinkStore::change", impl_->database.fail());
    const orvel::RaisedIdentity raised;
    std::vector<Link> links;
    bool there = false;
    link.reset();
    if (!impl_->database.open(there)) return false;
    if (!there) return true;
    vexo::LinkTransaction transaction(impl_->database);
    if (!transaction.begun() || !impl_->select("WHERE s.linkID = ?", id, links)) return false;
    if (links.empty() || links.front().owner != owner) return true;
    Link& found = links.front();
    if (!edit(found)) {
        link = found;
        return true;
    }
    if (!impl_->update(found) || !impl_->keepMore(found) || !transaction.commit()) {
        return false;
    }
    link = found;
    return true;
}

bool LinkStore::take(const std::string& id, const std::string& who, const std::string& what, bool partly,
                     LinkTaking& taking) {
    taking = LinkTaking::kTaken;
    VEXO_GATE("LinkStore::take", impl_->database.fail());
    const orvel::RaisedIdentity raised;
    bool there = false, part = false;
    if (!impl_->database.open(there)) return false;
    if (!there) {
        taking = LinkTaking::kGone;
        return true;
    }
    if (partly && !impl_->isPart(id, who, what, part)) return false;
    if (part) return true;
    // Whoever was faster may have counted it, or revoked the link.
    std::vector<Link> links;
    vexo::LinkTransaction transaction(impl_->database);
    if (!transaction.begun() || !impl_->select("WHERE s.linkID = ?", id, links)) return false;
    if (links.empty()) taking = LinkTaking::kGone;
    if (partly && !impl_->isPart(id, who, what, part)) return false;
    if (links.empty() || part) return true;
    return impl_->count(id, who, what, taking) && transaction.commit();
}

bool LinkStore::beginReceiving(const std::string& id, std::optional<Link>& link) {
    VEXO_GATE("LinkStore::beginReceiving", impl_->database.fail());
    const orvel::RaisedIdentity raised;
    std::vector<Link> links;
    bool there = false;
    link.reset();
    if (!impl_->database.open(there)) return false;
    if (!there) return true;
    impl_->receiving.emplace(impl_->database);
    if (!impl_->receiving->begun() || !impl_->select("WHERE s.linkID = ?", id, links)) return false;
    if (!links.empty() && links.front().receives) link = links.front();
    return true;
}

bool LinkStore::endReceiving(const std::string& id, const SentFile& file) {
    VEXO_GATE("LinkStore::endReceiving", impl_->database.fail());
    const orvel::RaisedIdentity raised;
    const std::string size = std::to_string(file.size), now = std::to_string(time(nullptr));
    const bool noted = impl_->receiving && impl_->run(kReceived, {id, size}) && impl_->run(kInsertMore, {id}) &&
                       impl_->run(kUsedNow, {id, now}) &&
                       impl_->run(kNoteSent, {id, now, file.address, file.name, size}) && impl_->receiving->commit();
    impl_->receiving.reset();
    return noted;
}

bool LinkStore::listSent(const std::string& id, const std::string& owner, std::int64_t offset, std::int64_t limit,
                         std::vector<SentFile>& files) {
    VEXO_GATE("LinkStore::listSent", impl_->database.fail());
    const orvel::RaisedIdentity raised;
    bool there = false;
    if (!impl_->database.open(there)) return false;
    const auto take = [&files](const vexo::Statement& row) {
        files.push_back({.name = vexo::textOf(row, 0),
                         .address = vexo::textOf(row, 1),
                         .size = vexo::numberOf(row, 2),
                         .time = vexo::numberOf(row, 3)});
    };
    return !there || impl_->database.run(kSelectSent, {id, owner, std::to_string(offset), std::to_string(limit)}, take);
}

bool LinkStore::remove(const std::string& id, const std::string& owner, bool& removed) {
    removed = false;
    VEXO_GATE("LinkStore::remove", impl_->database.fail());
    const orvel::RaisedIdentity raised;
    bool there = false;
    if (!impl_->database.open(there)) return false;
    if (!there) return true;
    vexo::LinkTransaction transaction(impl_->database);
    if (!transaction.begun() || !impl_->run(kDelete, {id, owner})) return false;
    bool found = impl_->database.changed() > 0;
    if (!impl_->run(kDeleteReceiving, {id, owner})) return false;
    found = found || impl_->database.changed() > 0;
    if (!found) return true;
    for (const char* beside : kDeleteBeside) {
        if (!impl_->run(beside, {id})) return false;
    }
    removed = transaction.commit();
    return removed;
}

}  // namespace VEXO
