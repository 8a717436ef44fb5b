// One file out of an archive, sent as it is unpacked.
#ifndef ORVEL_CGI_DOWNLOAD_MEMBER_H
#define ORVEL_CGI_DOWNLOAD_MEMBER_H

#include <vector>

#include "download/sending.h"

namespace orvel::cgi {

// `inside` is its path in the only source, an archive. It comes whole, from its beginning, in the headers of every
// download; one that turns out to be broken ends early. What came to more than "extract_max_ratio" and
// "extract_max_size" allow is cut off there. Refusals are 1401 to 1403 and those of an ArchiveRefusal, 408 where there
// is no such file, 1007 where too much lies before it.
void serveMember(Output& out, const User& user, const VEXO::WebCGI& web, const std::vector<Source>& sources);

}  // namespace orvel::cgi

#endif
