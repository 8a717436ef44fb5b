// What an operation is done to: paths of the request, or rows of a kept listing.
#ifndef ORVEL_CGI_OPERATION_CHOICE_H
#define ORVEL_CGI_OPERATION_CHOICE_H

#include <initializer_list>
#include <optional>
#include <string>
#include <vector>

#include "chosen_rows.h"
#include "operation/item.h"
#include "operation/progress.h"

namespace orvel::cgi {

class Choice {
 public:
    Choice() = default;
    explicit Choice(std::vector<std::string> paths) : paths_(std::move(paths)) {}

    // Finds the rows that the request chooses and opens their folder, which is then worked in, wherever its path leads
    // later. As ChosenRows; `data` says what a failure is about.
    int findRows(const User& user, const VEXO::WebCGI& web, Json::Value& data);

    // Rows of one folder, each of them once.
    [[nodiscard]] bool isRows() const { return rows_.has_value(); }
    [[nodiscard]] size_t size() const { return rows_ ? rows_->size() : paths_.size(); }
    // The share-relative path of one; of the folder where its name cannot be read any more.
    [[nodiscard]] std::string path(size_t position);
    // As openItem. 408, too, when a row is not what it was.
    int open(const User& user, size_t position, std::initializer_list<Need> needs, Item& item);
    // Reports what came into the folder since it was listed: that was not chosen, although it may look so.
    void reportNew(const User& user, Progress& progress);

 private:
    int openRow(const User& user, size_t position, std::initializer_list<Need> needs, Item& item);

    std::vector<std::string> paths_;
    std::optional<ChosenRows> rows_;
};

}  // namespace orvel::cgi

#endif
