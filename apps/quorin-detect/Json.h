#ifndef QUORIN_APPS_JSON_H
#define QUORIN_APPS_JSON_H

#include <string>
#include <vector>

#include "Faces.h"
#include "JsonString.h"

namespace qcli {

// {"rect":{...},"landmarks":{...},"roll":n}
std::string faceJson(const Face& face);

// [face, face, ...]
std::string facesJson(const std::vector<Face>& faces);

}  // namespace qcli

#endif
