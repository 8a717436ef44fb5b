/* Comparison of names. */
#ifndef VEXO_TEXT_H
#define VEXO_TEXT_H

#include "vexo/export.h"

VEXO_BEGIN_C
/* Compares two NUL-terminated strings code point by code point after simple case folding (u_foldCase). A byte that
 * begins no well-formed UTF-8 sequence compares as itself, above every code point; so the order is strict for any
 * bytes. Returns <0, 0 or >0. Neither argument may be null. */
VEXO_API int VLIBCUnicodeUTF8StrCaseCmp(const char* a, const char* b);
VEXO_END_C

#ifdef __cplusplus
#include <string>
#include <string_view>

namespace VEXO {
// Appends to `out` the sort key of `name`: comparing two keys bytewise (shorter prefix first) orders the names exactly
// as VLIBCUnicodeUTF8StrCaseCmp does. Keys are what a sort over many names folds once instead of at each comparison.
VEXO_API void AppendFoldKey(std::string_view name, std::string& out);
}  // namespace VEXO
#endif

#endif
