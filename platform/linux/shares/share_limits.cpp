#include "shares/share_limits.h"

#include <algorithm>
#include <array>
#include <iterator>
#include <unordered_set>

#include "shares/definition_lines.h"
#include "shares/share_definitions.h"

namespace vexo {
namespace {

// Options that keep nobody out of a share and nothing in it out of sight: who may enter, read and write is the same
// with any value of them. Keys without blanks.
constexpr std::string_view kHarmless =
    "abortshutdownscript accessbasedshareenum aclallowexecutealways aclcheckpermissions "
    "aclflaginheritedcanonicalization aclgroupcontrol aclmapfullcontrol addgroupscript additionaldnshostnames "
    "addmachinescript addportcommand addprintercommand addsharecommand adduserscript addusertogroupscript "
    "administrativeshare adminusers afstokenlifetime afsusernamemap aiomaxthreads aioreadsize aiowritebehind "
    "aiowritesize algorithmicridbase allocationroundupsize allowdcerpcauthlevelconnect allowdnsupdates "
    "allowinsecurewidelinks allownt4crypto allowtrusteddomains allowunsafeclusterupgrade announceas announceversion "
    "applygrouppolicies asyncdnstimeout asyncsmbechohandler autheventnotification authmethods autoservices "
    "binddnsdir binddnsdirectory bindinterfacesonly blockinglocks blocksize browselist cachedirectory casesensitive "
    "casesignames changenotify changesharecommand checkparentdirectorydeleteonclose checkpasswordscript cldapport "
    "clientipcmaxprotocol clientipcminprotocol clientipcsigning clientlanmanauth clientldapsaslwrapping "
    "clientmaxprotocol clientminprotocol clientntlmv2auth clientplaintextauth clientprotection clientschannel "
    "clientsigning clientsmb3encryptionalgorithms clientsmb3signingalgorithms clientsmbencrypt clientusekerberos "
    "clientusespnego clientusespnegoprincipal clusteraddresses clustering comment createkrb5conf cscpolicy "
    "ctdbdsocket ctdblocktimewarnthreshold ctdbtimeout cupsconnectiontimeout cupsencrypt cupsoptions cupsserver "
    "dcerpcendpointservers deadtime debugclass debugencryption debughirestimestamp debuglevel debugpid "
    "debugprefixtimestamp debugsyslogformat debugtimestamp debuguid dedicatedkeytabfile default defaultcase "
    "defaultdevmode defaultservice defersharingviolations deletegroupscript deleteprintercommand deletereadonly "
    "deletesharecommand deleteuserfromgroupscript deleteuserscript deletevetofiles dfreecachetime dfreecommand "
    "dgramport directorynamecachesize directorysecuritymask disablenetbios disablespoolss dmapisupport dnsforwarder "
    "dnsport dnsproxy dnsupdatecommand dnszonescavenging dnszonetransferclientsallow dnszonetransferclientsdeny "
    "domainlogons domainmaster doscharset dosfilemode dosfiletimeresolution dosfiletimes dsdbeventnotification "
    "dsdbgroupchangenotification dsdbpasswordeventnotification durablehandles easupport enableasusupport "
    "enablecorefiles enableprivileges enablespoolss encryptpasswords enhancedbrowsing enumportscommand eventloglist "
    "exec fakedirectorycreatetimes fakeoplocks forcedirectorysecuritymode forceprintername forcesecuritymode "
    "forceunknownacluser fstype getquotacommand getwdcache gpoupdatecommand guestaccount guestok hidedotfiles "
    "hidefiles hidespecialfiles homedirmap honorchangenotifyprivilege hostmsdfs hostnamelookups idmapbackend "
    "idmapcachetime idmapdomains idmapgid idmapnegativecachetime idmapuid includesystemkrb5conf "
    "initlogondelay initlogondelayedhosts interfaces iprintserver kdcdefaultdomainsupportedenctypes kdcenablefast "
    "kdcforceenablerc4weaksessionkeys kdcsupportedenctypes keepalive kerberosencryptiontypes kerberosmethod "
    "kernelchangenotify kerneloplocks kernelsharemodes kpasswdport krb5port lanmanauth largereadwrite ldapadmindn "
    "ldapconnectiontimeout ldapdebuglevel ldapdebugthreshold ldapdeletedn ldapderef ldapfollowreferral "
    "ldapgroupsuffix ldapidmapsuffix ldapmachinesuffix ldapmaxanonymousrequestsize ldapmaxauthenticatedrequestsize "
    "ldapmaxsearchrequestsize ldappagesize ldappasswdsync ldappasswordsync ldapreplicationsleep "
    "ldapserverrequirestrongauth ldapssl ldapsuffix ldaptimeout ldapuser ldapusersuffix level2oplocks lmannounce "
    "lminterval loadprinters localmaster lockdir lockdirectory locking lockspintime logfile logging loglevel "
    "lognttokencommand logondrive logonhome logonpath logonscript logwriteablefilesonexit lppausecommand "
    "lpqcachetime lpqcommand lpresumecommand lprmcommand lsaovernetlogon machinepasswordtimeout magicoutput "
    "magicscript manglednames mangleprefix manglingchar manglingmethod mapaclinherit maparchive maphidden "
    "mapreadonly mapsystem maptoguest maxconnections maxdisksize maxlogsize maxmux maxopenfiles maxprintjobs "
    "maxprotocol maxreportedprintjobs maxsmbdprocesses maxstatcachesize maxttl maxwinbindchildren maxwinsttl maxxmit "
    "mdnsname messagecommand mindomainuid minpasswordlength minprintspace minprotocol minreceivefilesize minwinsttl "
    "mitkdccommand msdfsroot msdfsshufflereferrals multicastdnsregister namecachetimeout nameresolveorder "
    "nbtclientsocketaddress nbtport ncalrpcdir netbiosaliases netbiosname netbiosscope neutralizent4emulation "
    "nishomedir nmbdbindexplicitbroadcast nsupdatecommand ntaclsupport nthashstore ntlmauth ntpipesupport "
    "ntpsigndsocketdirectory ntstatussupport nullpasswords obeypamrestrictions oldpasswordallowedperiod "
    "oplockbreakwaittime oplockcontentionlimit oplocks os2drivermap oslevel pampasswordchange panicaction "
    "paranoidserversecurity passdbbackend passdbexpandexplicit passwdchat passwdchatdebug passwdchattimeout "
    "passwdprogram passwordhashgpgkeyids passwordhashuserpasswordschemes passwordlevel passwordserver "
    "perfcountmodule piddirectory posixlocking postexec preexec preferedmaster preferredmaster "
    "preforkbackoffincrement preforkchildren preforkmaximumbackoff preload preloadmodules preservecase printcap "
    "printcapcachetime printcapname printcommand printer printername printing printjobusername "
    "printnotifybackchannel privatedir privatedirectory profileacls protocol public queuepausecommand "
    "queueresumecommand rawntlmv2auth readraw realm registryshares rejectmd5clients rejectmd5servers remoteannounce "
    "remotebrowsesync renameuserscript requirestrongkey resetonzerovc restrictanonymous rootpostexec rootpreexec "
    "rpcbigendian rpcserverdynamicportrange rpcserverport rpcstartondemandhelpers sambakcccommand security "
    "securitymask servermaxprotocol serverminprotocol servermultichannelsupport serverschannel "
    "serverschannelrequireseal serverservices serversigning serversmb3encryptionalgorithms "
    "serversmb3signingalgorithms serverstring setprimarygroupscript setquotacommand sharemodes shortpreservecase "
    "showaddprinterwizard shutdownscript smb1unixextensions smb2disablelocksequencechecking "
    "smb2disableoplockbreakretry smb2leases smb2maxcredits smb2maxread smb2maxtrans smb2maxwrite smbdasyncdosmode "
    "smbdforceprocesslocks smbdgetinfoasksharemode smbdmaxasyncdosmode smbdmaxxattrsize smbdprofilinglevel "
    "smbdsearchasksharemode smbpasswdfile smbports socketaddress socketoptions spnupdatecommand spotlight "
    "spotlightbackend statcache statedirectory storedosattributes strictallocate strictlocking strictrename "
    "strictsync svcctllist syncalways syslog syslogonly templatehomedir templateshell timeoffset timeserver "
    "timestamplogs tlscafile tlscertfile tlscrlfile tlsdhparamsfile tlsenabled tlskeyfile tlspriority tlsverifypeer "
    "unicode unixcharset unixextensions unixpasswordsync updateencrypted useclientdriver usemmap usernamelevel "
    "usernamemap usernamemapcachetime usernamemapscript usershareallowguests usesendfile usespnego "
    "utmp utmpdirectory vetooplockfiles volume volumeserialnumber widelinks winbindcachetime winbinddebugtraceid "
    "winbinddsocketdirectory winbindenumgroups winbindenumusers winbindexpandgroups winbindgid winbindmaxclients "
    "winbindmaxdomainconnections winbindnestedgroups winbindnormalizenames winbindnssinfo winbindofflinelogon "
    "winbindreconnectdelay winbindrefreshtickets winbindrequesttimeout winbindrpconly winbindscantrusteddomains "
    "winbindsealedpipes winbindseparator winbinduid winbindusedefaultdomain winbindusekrb5enterpriseprincipals "
    "winshook winsproxy winsserver winssupport workgroup writecachesize writeraw wtmpdirectory ";

// Parametric options belong to modules or services; those of the modules below do what their module does.
constexpr std::string_view kHarmlessPrefixes =
    "elasticsearch fss ldapsam spoolss winbind winsdb wreplsrv smbd idmap acl_xattr acl_tdb shadow streams nfs4 "
    "rpc_server rpc_daemon kdc dsdb samba_kcc tls vfs ";

// Modules that hide nothing and forbid nothing.
constexpr std::string_view kHarmlessModules =
    "aio_fork aio_linux aio_posix aio_pthread audit btrfs cap catia commit crossrename default_quota dirsort "
    "extd_audit fake_dfq fileid fruit full_audit io_uring linux_xfs_sgid netatalk offline posix_eadb prealloc preopen "
    "readahead recycle shadow_copy shadow_copy2 snapper streams_depot streams_xattr syncops time_audit widelinks "
    "xattr_tdb ";

using Words = std::unordered_set<std::string_view>;

Words wordsOf(std::string_view text) {
    Words words;
    while (!text.empty()) {
        const size_t end = text.find(' ');
        words.insert(text.substr(0, end));
        text.remove_prefix(end + 1);
    }
    return words;
}

bool isHarmlessModule(std::string_view name) {
    static const Words& modules = *new Words(wordsOf(kHarmlessModules));
    return modules.contains(name);
}

bool isHarmless(std::string_view key) {
    static const Words& keys = *new Words(wordsOf(kHarmless));
    static const Words& prefixes = *new Words(wordsOf(kHarmlessPrefixes));
    const size_t colon = key.find(':');
    if (colon == std::string_view::npos) return keys.contains(key);
    const std::string_view prefix = key.substr(0, colon);
    return prefixes.contains(prefix) || isHarmlessModule(prefix) || prefix.starts_with("idmapconfig");
}

// Tests of a value: whether the option closes the share with it.
bool saysYes(const std::string& text) {
    return parseBoolean(text).value_or(true);
}

bool saysNo(const std::string& text) {
    return !parseBoolean(text).value_or(false);
}

// An option that has more words than yes and no.
bool saysNotNo(const std::string& text) {
    return parseBoolean(text) != std::optional(false);
}

bool isSet(const std::string& text) {
    return !text.empty();
}

bool isNotZero(const std::string& text) {
    return text.find_first_not_of('0') != std::string::npos;
}

bool is(const std::string& text, std::initializer_list<std::string_view> words) {
    const std::string folded = foldedName(text);
    return std::find(words.begin(), words.end(), folded) != words.end();
}

bool namesHosts(const std::string& text) {
    return isSet(text) && !is(text, {"all", "0.0.0.0/0"});
}

bool loadsLimitingModule(const std::string& text) {
    const std::vector<std::string> modules = splitList(text);
    return std::any_of(modules.begin(), modules.end(), [](const std::string& module) {
        return !isHarmlessModule(std::string_view(module).substr(0, module.find(':')));
    });
}

bool demandsEncryption(const std::string& text) {
    return isSet(text) &&
           !is(text, {"default", "auto", "desired", "enabled", "if_required", "disabled", "off", "no", "false", "0"});
}

bool isOtherRoot(const std::string& text) {
    return isSet(text) && text != "/";
}

bool isOtherBackend(const std::string& text) {
    return isSet(text) && !is(text, {"file"});
}

bool isDomainController(const std::string& text) {
    return is(text, {"active directory domain controller", "domain controller", "dc"});
}

struct Limit {
    std::string_view name;  // as in smb.conf(5)
    bool (*closes)(const std::string& text);
    const char* why;
    bool everywhere = false;  // stated in [global] it counts for every share
};

constexpr const char* kByAddress = "who may enter by network address is not decided here";
constexpr const char* kElsewhere = "Samba reads its shares elsewhere, where they cannot be read here";

constexpr Limit kLimits[] = {
    {"hosts allow", namesHosts, kByAddress, true},
    {"hosts deny", isSet, kByAddress, true},
    {"guest only", saysYes, "everybody would be the guest account there"},
    {"force user", isSet, "everybody would be that user there"},
    {"inherit owner", saysNotNo, "files belong to whoever makes them here"},
    {"hide unreadable", saysYes, "names that a user cannot read would show"},
    {"hide unwriteable files", saysYes, "names that a user cannot write would show"},
    {"hide new files timeout", isNotZero, "new files would show at once"},
    {"dont descend", isSet, "the folders in it would show what they hold"},
    {"follow symlinks", saysNo, "links inside the share are followed; the setting link_policy_... changes that"},
    {"preexec close", saysYes, "a program decides who may enter"},
    {"root preexec close", saysYes, "a program decides who may enter"},
    {"vfs objects", loadsLimitingModule, "a module in it may keep users out"},
    {"server smb encrypt", demandsEncryption, "how the connection is encrypted is not decided here"},
    {"msdfs proxy", isSet, "the share lies on another server"},
    {"root directory", isOtherRoot, "the paths are those of another root", true},
    {"config backend", isOtherBackend, kElsewhere, true},
    {"config file", isSet, kElsewhere, true},
    {"server role", isDomainController, "a domain controller keeps access lists of its own", true},
    {"include", isSet, "what it includes depends on the client, or lies where it cannot be read"},
};

struct Synonym {
    std::string_view key, name;
};
constexpr Synonym kSynonyms[] = {
    {"allowhosts", "hosts allow"},        {"denyhosts", "hosts deny"}, {"onlyguest", "guest only"},
    {"vfsobject", "vfs objects"},         {"root", "root directory"},  {"rootdir", "root directory"},
    {"smbencrypt", "server smb encrypt"},
};

std::string withoutBlanks(std::string_view name) {
    std::string key;
    std::copy_if(name.begin(), name.end(), std::back_inserter(key), [](char c) { return c != ' '; });
    return key;
}

const Limit* findLimit(std::string_view key) {
    const auto* found = std::find_if(std::begin(kLimits), std::end(kLimits),
                                     [&](const Limit& l) { return withoutBlanks(l.name) == key; });
    return found == std::end(kLimits) ? nullptr : found;
}

// Nothing when the value does not close the share.
std::optional<Closing> closingOf(const std::string& key, const LimitValue& value) {
    const Limit* limit = findLimit(key);
    if (limit != nullptr && !limit->closes(value.text)) return std::nullopt;
    const char* why = limit != nullptr ? limit->why : "what it does is not known here";
    return Closing{value.name, value.text, why, value.place};
}

}  // namespace

std::string limitKey(std::string_view key) {
    for (const Synonym& synonym : kSynonyms) {
        if (synonym.key == key) return withoutBlanks(synonym.name);
    }
    return isHarmless(key) ? std::string() : std::string(key);
}

std::string limitName(const std::string& key, std::string_view written) {
    const Limit* limit = findLimit(key);
    return std::string(limit == nullptr ? trimmed(written) : limit->name);
}

std::vector<Closing> closingsOf(const LimitValues& own, const LimitValues& global,
                                const std::vector<std::string>& ignored) {
    std::vector<Closing> closings;
    const auto judge = [&](const std::string& key, const LimitValue& value) {
        if (std::find(ignored.begin(), ignored.end(), key) != ignored.end()) return false;
        std::optional<Closing> closing = closingOf(key, value);
        if (closing) closings.push_back(std::move(*closing));
        return closing.has_value();
    };
    for (const auto& [key, value] : global) {
        const Limit* limit = findLimit(key);
        if (limit != nullptr && limit->everywhere && judge(key, value)) return closings;
    }
    for (const auto& [key, value] : own) judge(key, value);
    return closings;
}

std::optional<std::string> unknownVariable(std::string_view text, std::string_view known) {
    constexpr std::string_view kVariables = "UGDIiJjLNMmRTtadhvwV$PSguHp";
    for (size_t i = 0; i + 1 < text.size(); ++i) {
        if (text[i] != '%') continue;
        const char letter = text[++i];
        if (kVariables.find(letter) != std::string_view::npos && known.find(letter) == std::string_view::npos) {
            return std::string("%") + letter;
        }
    }
    return std::nullopt;
}

}  // namespace vexo
