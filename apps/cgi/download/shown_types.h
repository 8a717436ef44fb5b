// What a browser may show as a document of its own.
#ifndef ORVEL_CGI_DOWNLOAD_SHOWN_TYPES_H
#define ORVEL_CGI_DOWNLOAD_SHOWN_TYPES_H

#include <string_view>

namespace orvel::cgi {

// The content type of a file of this name; nullptr for one that is saved only. Nothing is in the list that a browser
// could take for a program: HTML, SVG, XML and PDF are not.
const char* shownType(std::string_view name);

}  // namespace orvel::cgi

#endif
