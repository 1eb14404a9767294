// File-name matching as FindFirstFileA does it: the pattern is first rewritten into the
// DOS wildcard forms, then matched against the whole name, ignoring ASCII case.
//
//   "*.*"               -> "*"          everything, names without a dot included
//   "*" before "."      -> DOS_STAR     any run that stops at the name's last dot
//   "." before "?"/"*"  -> DOS_DOT      a dot, or nothing at the end of the name
//   "?"                 -> DOS_QM       one character, or nothing at a dot or the end
//   trailing "."        dropped, so "*." finds the names without a dot
//
// So "*.ic*" finds "a.icc" and "x.y.icm" but not "d.ic.bak": the part after the last
// dot must begin with "ic".
#ifndef TINTWELL_WIN32_WILDCARD_H
#define TINTWELL_WIN32_WILDCARD_H

#include <string_view>

namespace win32 {

// True when name matches pattern under the rules above. May throw std::bad_alloc.
bool MatchesFileWildcard(std::string_view pattern, std::string_view name);

}  // namespace win32

#endif
