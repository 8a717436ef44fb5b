// What file operations do to the results on screen.
#include <utility>
#include <vector>

#include "core/boundary.h"
#include "orvel/file_record.h"
#include "orvel/search_task.h"
#include "search/record_address.h"
#include "search/result_database.h"

namespace FileSearch {
namespace {

using orvel::ColumnValues;
using orvel::deriveAddress;
using orvel::RecordAddress;
using orvel::RecordCondition;
using orvel::ResultDatabase;
using Reach = RecordCondition::Reach;

constexpr unsigned kStatusFlags = VEXO_STAT_BASIC | VEXO_STAT_CREATE_TIME;

std::string lastComponent(const std::string& path) {
    return path.substr(path.rfind('/') + 1);
}

// A record below a folder that moved, as the database knew it.
struct MovedRecord {
    std::string within;
    _tag_VEXOSTAT_ status;
};

struct MovedRecords {
    std::vector<MovedRecord> list;
    bool complete = true;  // false when memory ran out
};

_tag_VEXOSTAT_ statusOf(const __tag_FI_FILE_INFO_DATA& record) {
    _tag_VEXOSTAT_ status{};
    status.st_mode = record.mode;
    status.st_uid = record.uid;
    status.st_gid = record.gid;
    status.st_size = record.size;
    status.st_create = record.created;
    status.st_change = record.changed;
    status.st_access = record.accessed;
    status.st_modify = record.modified;
    return status;
}

BOOL collect(__tag_FI_FILE_INFO_DATA* record, void* collection) {
    auto& records = *static_cast<MovedRecords*>(collection);
    records.complete = orvel::guardedQuietly(false, [&] {
        records.list.push_back({record->szPath, statusOf(*record)});
        return true;
    });
    return records.complete ? 1 : 0;
}

// Gives the record at `from` the address `to`, and what follows from that and from its status.
bool moveRecord(const ResultDatabase& database, const RecordAddress& from, const RecordAddress& to,
                const _tag_VEXOSTAT_& status) {
    const std::string name = lastComponent(to.realPath);
    FileRecord record;
    static_cast<void>(record.fill(to.realPath, to.shareRoot, to.share, name, status));
    ColumnValues columns;
    columns.addAddress(record.data());
    columns.addStatus(record.data());
    columns.addRest(record.data());
    return database.update(columns, RecordCondition(from, Reach::kItself));
}

}  // namespace

bool OrvSearchDBTask::delRecs(std::string shareName, std::string path) {
    return orvel::guardedQuietly(false, [&] {
        RecordAddress address;
        if (!deriveAddress(shareName, path, owner_, address)) return false;
        const ResultDatabase database(filePath_);
        return database.remove(RecordCondition(address, Reach::kItself)) &&
               database.remove(RecordCondition(address, Reach::kBelow));
    });
}

bool OrvSearchDBTask::updatePermRecs(std::string shareName, std::string path, const char* userName,
                                     const char* groupName, _tag_VEXOSTAT_& status) {
    return orvel::guardedQuietly(false, [&] {
        RecordAddress address;
        if (!deriveAddress(shareName, path, owner_, address)) return false;
        const std::string name = lastComponent(address.realPath);
        FileRecord record;
        static_cast<void>(record.fill(address.realPath, address.shareRoot, address.share, name, status,
                                      userName == nullptr ? "" : userName, groupName == nullptr ? "" : groupName));
        ColumnValues columns;
        if (userName != nullptr) columns.add(FI_COL_OWNER, record.data().szOwner);
        if (groupName != nullptr) columns.add(FI_COL_GROUP, record.data().szGroup);
        columns.addStatus(record.data());
        return ResultDatabase(filePath_).update(columns, RecordCondition(address, Reach::kItself));
    });
}

bool OrvSearchDBTask::insertFile(std::string shareName, std::string path, std::string owner, std::string group,
                                 _tag_VEXOSTAT_& status) {
    return orvel::guardedQuietly(false, [&] {
        RecordAddress address;
        if (!deriveAddress(shareName, path, owner_, address)) return false;
        const ResultDatabase database(filePath_);
        bool present = false;
        if (!database.find(address, present)) return false;
        const std::string name = lastComponent(address.realPath);
        FileRecord record;
        static_cast<void>(record.fill(address.realPath, address.shareRoot, address.share, name, status, owner, group));
        return present || database.insert(record.data());
    });
}

bool OrvSearchDBTask::updateFile(std::string shareName, std::string path, std::string newShareName, std::string newPath,
                                 _tag_VEXOSTAT_& status) {
    return orvel::guardedQuietly(false, [&] {
        RecordAddress from, to;
        return deriveAddress(shareName, path, owner_, from) && deriveAddress(newShareName, newPath, owner_, to) &&
               moveRecord(ResultDatabase(filePath_), from, to, status);
    });
}

bool OrvSearchDBTask::updateFileInFolder(std::string shareName, std::string path, std::string newShareName,
                                         std::string newPath) {
    return orvel::guardedQuietly(false, [&] {
        RecordAddress from, to;
        if (!deriveAddress(shareName, path, owner_, from) || !deriveAddress(newShareName, newPath, owner_, to)) {
            return false;
        }
        // All of them before the first is moved: a database that is read is not written to.
        MovedRecords records;
        const RecordCondition below(from, Reach::kBelow);
        const ResultDatabase database(filePath_);
        if (!database.select(below, collect, &records) || !records.complete) return false;
        const std::size_t prefix = from.within.empty() ? 0 : from.within.size() + 1;
        bool all = true;  // one that cannot be moved keeps no other from it
        for (MovedRecord& record : records.list) {
            const std::string rest = record.within.substr(prefix);
            RecordAddress source, target;
            _tag_VEXOSTAT_ present{};
            const bool placed = addressWithin(from, record.within, source) &&
                                addressWithin(to, to.within.empty() ? rest : to.within + "/" + rest, target);
            const bool readable = placed && VLIBCFileLStat(target.realPath.c_str(), kStatusFlags, &present) >= 0;
            all = placed && moveRecord(database, source, target, readable ? present : record.status) && all;
        }
        return all;
    });
}

}  // namespace FileSearch
