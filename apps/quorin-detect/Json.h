#ifndef QUORIN_APPS_JSON_H
#define QUORIN_APPS_JSON_H

#include <string>
#include <vector>

#include "Faces.h"

namespace qcli {

// A JSON string literal of any bytes: quotes, backslashes and control
// characters are escaped, and bytes that are not valid UTF-8 become U+FFFD, so
// the output is valid JSON for every file name.
std::string jsonString(const std::string& text);

// {"rect":{...},"landmarks":{...},"roll":n}
std::string faceJson(const Face& face);

// [face, face, ...]
std::string facesJson(const std::vector<Face>& faces);

}  // namespace qcli

#endif
