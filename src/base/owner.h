// Owners for what C functions hand out: `std::unique_ptr<DIR, Releaser<closedir>>`.
#ifndef ORVEL_BASE_OWNER_H
#define ORVEL_BASE_OWNER_H

#include <memory>

namespace orvel {

// The deleter that calls `release`, a function of the record's pointer.
template <auto release>
struct Releaser {
    template <class Record>
    void operator()(Record* record) const {
        release(record);
    }
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
