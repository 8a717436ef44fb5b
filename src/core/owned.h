// One move-only owner for each kind of record that the platform hands out.
#ifndef ORVEL_CORE_OWNED_H
#define ORVEL_CORE_OWNED_H

#include <dirent.h>
#include <sqlite3.h>

#include <cstdlib>
#include <memory>

#include "base/descriptor.h"
#include "base/owner.h"
#include "vexo/database.h"
#include "vexo/language.h"
#include "vexo/list.h"
#include "vexo/share.h"
#include "vexo/user.h"

namespace orvel {

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

}  // namespace orvel

#endif
