#include "operation/choice.h"

#include <fcntl.h>

#include <cerrno>

#include "orvel/error_state.h"

namespace orvel::cgi {

int Choice::findRows(const User& user, const VEXO::WebCGI& web, Json::Value& data) {
    ChosenRows& rows = rows_.emplace();
    int code = rows.find(user, web);
    if (code == ORV_ERR_NONE) code = rows.openFolder(user);
    if (code == ORV_ERR_NONE) return code;
    rows.explain(data);
    paths_ = {rows.path()};
    rows_.reset();
    return code;
}

std::string Choice::path(size_t position) {
    if (!rows_) return paths_[position];
    KeptRow row;
    return rows_->row(position, row) == ORV_ERR_NONE ? rows_->opened().info.path + "/" + row.name
                                                     : rows_->opened().info.path;
}

int Choice::open(const User& user, size_t position, std::initializer_list<Need> needs, Item& item) {
    return rows_ ? openRow(user, position, needs, item) : openItem(user, paths_[position], needs, item);
}

int Choice::openRow(const User& user, size_t position, std::initializer_list<Need> needs, Item& item) {
    KeptRow row;
    int code = rows_->row(position, row);
    if (code != ORV_ERR_NONE) return code;
    const OpenedFolder& opened = rows_->opened();
    item.info = opened.info;
    item.info.path += "/" + row.name;
    item.info.realPath += "/" + row.name;
    for (const Need need : needs) {
        code = judge(user, item.info.path, need);
        if (code != ORV_ERR_NONE) return code;
    }
    code = checkChangeable(needs, opened.folder, row.name);
    if (code == ORV_ERR_NONE) code = rows_->look(row, item.status);
    if (code != ORV_ERR_NONE) return code;
    item.place.folder = Descriptor(fcntl(opened.folder.get(), F_DUPFD_CLOEXEC, 0));
    item.place.name = row.name;
    item.realFolder = realPathOf(opened.folder);
    const bool there = item.place.folder && !item.realFolder.empty();
    return there ? ORV_ERR_NONE : refusalCode(errno, item.info.realPath);
}

void Choice::reportNew(const User& user, Progress& progress) {
    std::vector<std::string> names;
    if (!rows_ || rows_->namesSince(user, names) != ORV_ERR_NONE || names.empty()) return;
    progress.noteNew(rows_->opened().info.path, names);
}

}  // namespace orvel::cgi
