// Sending what was found: one file with ranges, or several files and folders as one zip.
#ifndef ORVEL_CGI_DOWNLOAD_SENDING_H
#define ORVEL_CGI_DOWNLOAD_SENDING_H

#include <sys/stat.h>

#include <string>
#include <vector>

#include "base/descriptor.h"
#include "output.h"
#include "reply.h"
#include "request.h"

namespace orvel::cgi {

// A file or folder, open for reading.
struct Source {
    std::string path;  // share-relative, for the log
    std::string name;  // for the client to save it under
    Descriptor opened;
    struct stat status {};
};

// Opens for reading what was found (opened O_PATH) when it is a file or folder: opening a device can already do
// something. 0 or a library code; `realPath` is where it lies.
int openFound(const Descriptor& found, const std::string& realPath, Source& source);

// A refusal must not be taken for the file: unlike in other programs it shows in the HTTP status.
Status httpStatusOf(int code);

// Answer a request for one file (HEAD and GET with Range, If-Range, If-None-Match and If-Modified-Since), and for
// anything else as a zip named `name` + ".zip"; both write the log entry of `user`.
void serveFile(Output& out, const User& user, const Source& source);
void serveZip(Output& out, const User& user, std::vector<Source>& sources, const std::string& name);

}  // namespace orvel::cgi

#endif
