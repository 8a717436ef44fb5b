#include "index/index_columns.h"

#include <array>
#include <string>

namespace vexo::fileindex {
namespace {

// Extension stands twice: results are sorted "by type" through it.
constexpr std::array<Column, FI_COL_GROUP + 1> kColumns = {{{"name", true},
                                                            {"share_root", true},
                                                            {"extension", true},
                                                            {"parent", true},
                                                            {"share", true},
                                                            {"path", true},
                                                            {"is_dir", false},
                                                            {"size", false},
                                                            {"extension", true},
                                                            {"created", false},
                                                            {"changed", false},
                                                            {"accessed", false},
                                                            {"modified", false},
                                                            {"permission", true},
                                                            {"mode", false},
                                                            {"uid", false},
                                                            {"gid", false},
                                                            {"owner", true},
                                                            {"group_name", true}}};

using Record = __tag_FI_FILE_INFO_DATA;

// Texts first, in the order of kRecordColumns, then the numbers.
constexpr std::array<const char * Record::*, 9> kTextFields = {
    &Record::szName,      &Record::szShare,      &Record::szPath,  &Record::szParent, &Record::szShareRoot,
    &Record::szExtension, &Record::szPermission, &Record::szOwner, &Record::szGroup};
// Of these, what the index of a share does not store.
constexpr std::array<bool, kTextFields.size()> kImplied = {false, true, true, false, true};
constexpr std::array<int64_t Record::*, 5> kLongFields = {&Record::size, &Record::created, &Record::changed,
                                                          &Record::accessed, &Record::modified};
constexpr std::array<uint32_t Record::*, 3> kShortFields = {&Record::mode, &Record::uid, &Record::gid};

}  // namespace

const char* const kRecordColumns =
    "name,share,path,parent,share_root,extension,permission,owner,group_name,"
    "is_dir,size,created,changed,accessed,modified,mode,uid,gid";

const Column* columnOf(int number) {
    const bool known = number >= 0 && static_cast<size_t>(number) < kColumns.size();
    return known ? &kColumns[static_cast<size_t>(number)] : nullptr;
}

bool isStoredInShare(int column) {
    return column != FI_COL_SHARE && column != FI_COL_PATH && column != FI_COL_SHARE_ROOT;
}

std::string insertionSql(bool ofShare) {
    return ofShare
               ? "INSERT OR IGNORE INTO record(name,parent,extension,permission,owner,group_name,is_dir,size,created,"
                 "changed,accessed,modified,mode,uid,gid,id) VALUES(?,?,?,?,?,?,?,?,?,?,?,?,?,?,?,?)"
               : std::string("INSERT OR IGNORE INTO record(") + kRecordColumns +
                     ",id) VALUES(?,?,?,?,?,?,?,?,?,?,?,?,?,?,?,?,?,?,?)";
}

bool bindRecord(Statement& statement, const Record& record, bool ofShare, int& at) {
    for (size_t i = 0; i < kTextFields.size(); ++i) {
        if (ofShare && kImplied[i]) continue;
        const char* text = record.*kTextFields[i];
        if (!statement.bindText(++at, text == nullptr ? "" : text)) return false;
    }
    if (!statement.bind(++at, static_cast<int64_t>(record.isDir != 0))) return false;
    for (const auto field : kLongFields) {
        if (!statement.bind(++at, record.*field)) return false;
    }
    for (const auto field : kShortFields) {
        if (!statement.bind(++at, static_cast<int64_t>(record.*field))) return false;
    }
    return true;
}

OwnedRecord::OwnedRecord(const Statement& statement, int first) : starts_{}, numbers_{} {
    static_assert(kTextFields.size() == kTexts);
    int at = first;
    for (size_t& start : starts_) {
        start = texts_.size();
        // What a NUL would hide is left out, so that every text ends where it seems to.
        texts_ += statement.text(at++).data();
        texts_ += '\0';
    }
    numbers_.isDir = static_cast<int>(statement.number(at++) != 0);
    for (const auto field : kLongFields) numbers_.*field = statement.number(at++);
    for (const auto field : kShortFields) numbers_.*field = static_cast<uint32_t>(statement.number(at++));
}

Record OwnedRecord::view() const {
    Record record = numbers_;
    for (size_t i = 0; i < kTextFields.size(); ++i) record.*kTextFields[i] = texts_.data() + starts_[i];
    return record;
}

}  // namespace vexo::fileindex
