// One move-only owner for each kind of record that the platform hands out.
#ifndef ORVEL_CORE_OWNED_H
#define ORVEL_CORE_OWNED_H

#include <dirent.h>
#include <sqlite3.h>
#include <unistd.h>

#include <cstdlib>
#include <memory>
#include <utility>

#include "vexo/database.h"
#include "vexo/language.h"
#include "vexo/list.h"
#include "vexo/share.h"
#include "vexo/user.h"

namespace orvel {

template <auto release>
struct Releaser {
    template <class Record>
    void operator()(Record* record) const {
        release(record);
    }
};

using ShareRecord = std::unique_ptr<VEXOSHARE, Releaser<VEXOShareFree>>;
using ShareDatabase = std::unique_ptr<VEXOSHAREDB, Releaser<VEXOShareDBClose>>;
using LoadedShare = std::unique_ptr<SDK::Share, Releaser<SDK::Share::Release>>;
using UserRecord = std::unique_ptr<VEXOUSER, Releaser<VEXOUserFree>>;
using GroupRecord = std::unique_ptr<VEXOGROUP, Releaser<VEXOGroupFree>>;
using UserDatabase = std::unique_ptr<VEXOUSERDB, Releaser<VEXOUserDBClose>>;
using GroupDatabase = std::unique_ptr<VEXOGROUPDB, Releaser<VEXOGroupDBClose>>;
using StringList = std::unique_ptr<VLIBCSZLIST, Releaser<VLIBCSzListFree>>;
using StringHash = std::unique_ptr<_VLIBCSZHASH_, Releaser<VLIBCSzHashFree>>;
using StringBundle = std::unique_ptr<VEXOSTRINGS, Releaser<VexoCgiStringBundleClose>>;
using DatabaseConnection = std::unique_ptr<VEXODB, Releaser<VEXODBClose>>;
using DatabaseResult = std::unique_ptr<VEXODBRESULT, Releaser<VEXODBFreeResult>>;
using SqlText = std::unique_ptr<char, Releaser<sqlite3_free>>;
using CString = std::unique_ptr<char, Releaser<std::free>>;
using Directory = std::unique_ptr<DIR, Releaser<closedir>>;

class Descriptor {
 public:
    explicit Descriptor(int fd = -1) : fd_(fd) {}
    ~Descriptor() { reset(); }
    Descriptor(Descriptor&& other) noexcept : fd_(std::exchange(other.fd_, -1)) {}
    Descriptor& operator=(Descriptor&& other) noexcept {
        if (this != &other) {
            reset();
            fd_ = std::exchange(other.fd_, -1);
        }
        return *this;
    }
    [[nodiscard]] int get() const { return fd_; }
    [[nodiscard]] int release() { return std::exchange(fd_, -1); }
    explicit operator bool() const { return fd_ >= 0; }
    void reset() {
        if (fd_ >= 0) close(fd_);
        fd_ = -1;
    }

 private:
    int fd_;
};

// Passes an owner to an acquiring function that fills a plain pointer: `VEXOShareGet(name, acquire(share))`.
template <class Owner>
class Acquire {
 public:
    explicit Acquire(Owner& owner, typename Owner::pointer record = nullptr) : owner_(owner), record_(record) {}
    ~Acquire() { owner_.reset(record_); }
    Acquire(const Acquire&) = delete;
    Acquire& operator=(const Acquire&) = delete;
    operator typename Owner::pointer *() { return &record_; }

 private:
    Owner& owner_;
    typename Owner::pointer record_;
};

template <class Owner>
Acquire<Owner> acquire(Owner& owner) {
    return Acquire<Owner>(owner);
}

// Passes an owner to a function that changes the record in place and may move it: `VLIBCSzListPush(lend(list), text)`.
template <class Owner>
Acquire<Owner> lend(Owner& owner) {
    return Acquire<Owner>(owner, owner.release());
}

}  // namespace orvel

#endif
