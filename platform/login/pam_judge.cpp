// A log-in by PAM: for the machine's own users.
#include <pwd.h>
#include <security/pam_appl.h>
#include <strings.h>
#include <syslog.h>
#include <unistd.h>

#include <algorithm>
#include <cstdlib>
#include <cstring>
#include <initializer_list>
#include <string>

#include "base/printable.h"
#include "talk.h"

namespace vexo::login {
namespace {

constexpr const char* kService = "orvel";
constexpr const char* kTerminal = "orvel";  // some modules want one to name

bool isServiceIn(const char* folder) {
    return access((std::string(folder) + "/" + kService).c_str(), R_OK) == 0;
}

// PAM itself would take the service "other" for one that is missing.
bool isServiceThere() {
    return folderOfTests() != nullptr || isServiceIn("/etc/pam.d") || isServiceIn("/usr/lib/pam.d");
}

class Pam {
 public:
    explicit Pam(Talk& talk) : talk_(talk) {
        const pam_conv conversation = {&Pam::converse, this};
        const char* folder = folderOfTests();
        result_ = folder == nullptr ? pam_start(kService, talk.user().c_str(), &conversation, &handle_)
                                    : pam_start_confdir(kService, talk.user().c_str(), &conversation, folder, &handle_);
        set(PAM_RHOST, talk.address().c_str());
        set(PAM_TTY, kTerminal);
        const auto wait = &Pam::waitAfterFailure;
        set(PAM_FAIL_DELAY, reinterpret_cast<const void*>(wait));
    }
    ~Pam() {
        if (handle_ != nullptr) pam_end(handle_, result_);
    }
    Pam(const Pam&) = delete;
    Pam& operator=(const Pam&) = delete;

    int run(int (*step)(pam_handle_t*, int), int flags) {
        if (result_ == PAM_SUCCESS) result_ = step(handle_, flags);
        return result_;
    }
    int change() { return result_ = pam_chauthtok(handle_, PAM_CHANGE_EXPIRED_AUTHTOK); }
    [[nodiscard]] std::string user() const {
        const void* item = nullptr;
        if (pam_get_item(handle_, PAM_USER, &item) != PAM_SUCCESS || item == nullptr) return "";
        return static_cast<const char*>(item);
    }
    [[nodiscard]] const char* reason() const { return pam_strerror(handle_, result_); }

 private:
    void set(int item, const void* value) {
        if (result_ == PAM_SUCCESS) result_ = pam_set_item(handle_, item, value);
    }

    // The delay that the modules asked for, counted from the answer and not from when they had judged it.
    static void waitAfterFailure(int result, unsigned microseconds, void* own) {
        if (result == PAM_SUCCESS || own == nullptr) return;
        static_cast<Pam*>(own)->talk_.waitAsForAnyFailure(std::chrono::microseconds(microseconds));
    }

    static int converse(int count, const pam_message** messages, pam_response** responses, void* own) {
        auto* pam = static_cast<Pam*>(own);
        if (count <= 0 || count > PAM_MAX_NUM_MSG || messages == nullptr || responses == nullptr) return PAM_CONV_ERR;
        auto* given = static_cast<pam_response*>(calloc(static_cast<size_t>(count), sizeof(pam_response)));
        if (given == nullptr) return PAM_BUF_ERR;
        for (int i = 0; i < count; ++i) {
            if (pam->answer(*messages[i], given[i])) continue;
            for (int done = 0; done < i; ++done) drop(given[done]);
            free(given);
            return PAM_CONV_ERR;
        }
        *responses = given;
        return PAM_SUCCESS;
    }

    static void drop(pam_response& response) {
        if (response.resp == nullptr) return;
        explicit_bzero(response.resp, strlen(response.resp));
        free(response.resp);
    }

    bool answer(const pam_message& message, pam_response& response) {
        const char* text = message.msg == nullptr ? "" : message.msg;
        if (message.msg_style == PAM_TEXT_INFO || message.msg_style == PAM_ERROR_MSG) {
            talk_.say(text);
            return true;
        }
        if (message.msg_style != PAM_PROMPT_ECHO_OFF && message.msg_style != PAM_PROMPT_ECHO_ON) return false;
        Secret secret;
        const bool asked = talk_.ask(text, message.msg_style == PAM_PROMPT_ECHO_OFF, secret);
        if (asked) response.resp = strdup(secret.text);
        return response.resp != nullptr;
    }

    Talk& talk_;
    pam_handle_t* handle_ = nullptr;
    int result_ = PAM_SUCCESS;
};

bool isOneOf(int result, std::initializer_list<int> list) {
    return std::find(list.begin(), list.end(), result) != list.end();
}

// Where only the service can be to blame; its other answers are about the user, and none of them may say which.
void refuseBroken(Talk& talk, const Pam& pam, const char* phase) {
    syslog(LOG_ERR, "log-in: PAM cannot judge %s: %s", phase, orvel::printable(pam.reason()).c_str());
    talk.refuse(VEXO_LOGIN_SERVICE);
}

constexpr std::initializer_list<int> kBroken = {PAM_OPEN_ERR,   PAM_SYMBOL_ERR,       PAM_SERVICE_ERR,
                                                PAM_SYSTEM_ERR, PAM_BUF_ERR,          PAM_CONV_ERR,
                                                PAM_ABORT,      PAM_AUTHINFO_UNAVAIL, PAM_MODULE_UNKNOWN};

// False when a refusal was said.
bool authenticate(Talk& talk, Pam& pam) {
    const int result = pam.run(pam_authenticate, PAM_DISALLOW_NULL_AUTHTOK);
    if (result == PAM_SUCCESS) return true;
    if (isOneOf(result, kBroken)) {
        refuseBroken(talk, pam, "passwords");
    } else {
        talk.waitAsForAnyFailure({});
        talk.refuse(VEXO_LOGIN_WRONG);
    }
    return false;
}

bool askAccount(Talk& talk, Pam& pam) {
    int result = pam.run(pam_acct_mgmt, PAM_DISALLOW_NULL_AUTHTOK);
    bool expired = isOneOf(result, {PAM_ACCT_EXPIRED, PAM_AUTHTOK_EXPIRED});
    if (result == PAM_NEW_AUTHTOK_REQD) {
        result = pam.change();
        expired = result != PAM_SUCCESS;
    }
    if (result == PAM_SUCCESS) return true;
    if (expired) {
        talk.refuse(VEXO_LOGIN_EXPIRED);
    } else if (isOneOf(result, kBroken)) {
        refuseBroken(talk, pam, "accounts");
    } else {
        talk.refuse(result == PAM_USER_UNKNOWN ? VEXO_LOGIN_WRONG : VEXO_LOGIN_LOCKED);
    }
    return false;
}

// As the machine spells it, where the service kept what was typed and the case of a name does not count.
std::string spelled(const std::string& user) {
    const passwd* record = getpwnam(user.c_str());
    return record != nullptr && strcasecmp(record->pw_name, user.c_str()) == 0 ? record->pw_name : user;
}

}  // namespace

const char* folderOfTests() {
#ifdef VEXO_FAULT_GATE
    const char* folder = getenv("VEXO_GATE_PAM");
    if (folder != nullptr && isServiceIn(folder)) return folder;
#endif
    return nullptr;
}

void judgeByPam(Talk& talk) {
    if (!isServiceThere()) {
        syslog(LOG_ERR, "log-in: the PAM service %s is missing: /etc/pam.d/%s", kService, kService);
        return talk.refuse(VEXO_LOGIN_SERVICE);
    }
    Pam pam(talk);
    if (authenticate(talk, pam) && askAccount(talk, pam)) admitUser(talk, spelled(pam.user()));
}

}  // namespace vexo::login
