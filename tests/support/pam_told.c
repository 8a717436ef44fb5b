/* A PAM module that does what its arguments say, in their order, in each phase that it stands in:
 *   say=TEXT          shows a text
 *   ask=TEXT show=TEXT  asks a question whose answer is hidden, or shown
 *   want=ANSWER       fails (PAM_AUTH_ERR) when the last answer is another
 *   user=NAME         makes it another user's log-in
 *   note=FILE         appends "PHASE HOST USER" to a file
 *   hang crash must_change locked delay   what they say */
#include <security/pam_appl.h>
#include <security/pam_ext.h>
#include <security/pam_modules.h>
#include <signal.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <unistd.h>

static void note(pam_handle_t *pam, const char *file, const char *phase) {
    const void *host = NULL;
    const void *user = NULL;
    pam_get_item(pam, PAM_RHOST, &host);
    pam_get_item(pam, PAM_USER, &user);
    FILE *out = fopen(file, "a");
    if (out == NULL) return;
    fprintf(out, "%s %s %s\n", phase, host == NULL ? "" : (const char *)host, user == NULL ? "" : (const char *)user);
    fclose(out);
}

static int follow(pam_handle_t *pam, const char *phase, int count, const char **words) {
    char *answer = NULL;
    for (int i = 0; i < count; ++i) {
        const char *value = strchr(words[i], '=');
        const size_t length = value == NULL ? strlen(words[i]) : (size_t)(value - words[i]);
        value = value == NULL ? "" : value + 1;
#define IS(text) (length == strlen(text) && strncmp(words[i], text, length) == 0)
        if (IS("say")) pam_info(pam, "%s", value);
        if (IS("ask") || IS("show")) {
            free(answer);
            answer = NULL;
            const int style = IS("ask") ? PAM_PROMPT_ECHO_OFF : PAM_PROMPT_ECHO_ON;
            if (pam_prompt(pam, style, &answer, "%s", value) != PAM_SUCCESS) return PAM_CONV_ERR;
        }
        if (IS("want") && (answer == NULL || strcmp(answer, value) != 0)) return PAM_AUTH_ERR;
        if (IS("user")) pam_set_item(pam, PAM_USER, value);
        if (IS("note")) note(pam, value, phase);
        if (IS("delay")) pam_fail_delay(pam, 700000);
        if (IS("must_change")) return PAM_NEW_AUTHTOK_REQD;
        if (IS("locked")) return PAM_PERM_DENIED;
        if (IS("crash")) raise(SIGSEGV);
        while (IS("hang")) pause();
#undef IS
    }
    free(answer);
    return PAM_SUCCESS;
}

int pam_sm_authenticate(pam_handle_t *pam, int flags, int count, const char **words) {
    (void)flags;
    return follow(pam, "auth", count, words);
}

int pam_sm_setcred(pam_handle_t *pam, int flags, int count, const char **words) {
    (void)pam, (void)flags, (void)count, (void)words;
    return PAM_SUCCESS;
}

int pam_sm_acct_mgmt(pam_handle_t *pam, int flags, int count, const char **words) {
    (void)flags;
    return follow(pam, "account", count, words);
}

int pam_sm_chauthtok(pam_handle_t *pam, int flags, int count, const char **words) {
    if ((flags & PAM_PRELIM_CHECK) != 0) return PAM_SUCCESS;
    return follow(pam, "password", count, words);
}
