#ifndef QUORIN_APPS_JSONSTRING_H
#define QUORIN_APPS_JSONSTRING_H

#include <string>

namespace qcli {

// A JSON string literal of any bytes: quotes, backslashes and control
// characters are escaped, and bytes that are not valid UTF-8 become U+FFFD, so
// the output is valid JSON for every file name, label or object name.
std::string jsonString(const std::string& text);

}  // namespace qcli

#endif
