// Sending what was found: one file with ranges, or several files and folders as one zip.
#ifndef ORVEL_CGI_DOWNLOAD_SENDING_H
#define ORVEL_CGI_DOWNLOAD_SENDING_H

#include <sys/stat.h>

#include <functional>
#include <string>
#include <vector>

#include "base/descriptor.h"
#include "chosen_rows.h"
#include "output.h"
#include "reply.h"
#include "request.h"

namespace orvel::cgi {

// A file or folder to be sent.
struct Source {
    std::string asked;  // the path as the request has it
    std::string path;   // share-relative
    std::string name;   // for the client to save it under
    Descriptor opened;  // for reading; one of many is opened when its turn comes
    struct stat status {};
};

// Finds what `asked` says and opens it as the calling identity. 0 or a library code.
using OpenSource = std::function<int(Source& source)>;

// Looks at every path, once each, as what cannot be had must show in the status: `culprit` then. One source alone stays
// open. 0 or a library code.
int findSources(const std::vector<std::string>& paths, const OpenSource& open, std::vector<Source>& sources,
                std::string& culprit);

// Opens for reading what was found (opened O_PATH) when it is a file or folder: opening a device can already do
// something. 0 or a library code; `realPath` is where it lies.
int openFound(const Descriptor& found, const std::string& realPath, Source& source);

// Resolves `source.asked`, asks for the privilege to download it, and opens it as the user, whose identity the process
// has taken on. 0 or a library code.
int openToSend(const User& user, Source& source);

// The same of the file as it was in the snapshot `version`; it is called so. 400 for a folder.
int openVersionToSend(const User& user, const std::string& version, Source& source);

// Opens a row of a kept listing, whose folder is open. 0 or a library code.
int openRow(const ChosenRows& rows, const KeptRow& row, Source& source);

// A refusal must not be taken for the file: unlike in other programs it shows in the HTTP status.
Status httpStatusOf(int code);

// The headers that every download carries: no guessing of types, nothing shown in place unless it is `shown`.
void putCommon(Output& out, const std::string& cookie, const std::string& name, const char* type, bool shown = false);

// Answer a request for one file (HEAD and GET with Range, If-Range, If-None-Match and If-Modified-Since), and for
// anything else as a zip named `name` + ".zip"; both write the log entry of `user`. `show`: what a browser may show, it
// shows. A source that is not open is opened when its turn comes, and has to be what it was.
void serveFile(Output& out, const User& user, const Source& source, bool show);
void serveZip(Output& out, const User& user, std::vector<Source>& sources, const std::string& name,
              const OpenSource& open);
// The same of rows whose folder is open: one after the other is opened in it, and has to be what was listed.
void serveZip(Output& out, const User& user, ChosenRows& rows, const std::string& name);

}  // namespace orvel::cgi

#endif
