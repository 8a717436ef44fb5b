// How the reading of an upload can fail.
#ifndef VEXO_UPLOAD_H
#define VEXO_UPLOAD_H

enum _tag_cgi_upload_errno_ : int {
    CGI_UPLOAD_OTHER = -14,
    CGI_UPLOAD_MEMORY = -13,
    CGI_UPLOAD_INTERNAL = -12,
    CGI_UPLOAD_QUOTA = -11,
    CGI_UPLOAD_NAME_TOO_LONG = -10,
    CGI_UPLOAD_WRITE = -9,      // the temporary file could not be written, for no reason named here
    CGI_UPLOAD_SIZE = -8,       // the body's length is missing, malformed or not what was announced
    CGI_UPLOAD_FIELD = -7,      // a required field of the form is missing or malformed
    CGI_UPLOAD_TORN_FORM = -6,  // the body ends within the form
    CGI_UPLOAD_BAD_FORM = -5,   // no form of this kind: content type, boundary or a part's header
    CGI_UPLOAD_MISSING = -4,    // the folder for the temporary file
    CGI_UPLOAD_READ_ONLY = -3,
    CGI_UPLOAD_NO_SPACE = -2,
    CGI_UPLOAD_DENIED = -1
};

#endif
