#include "quorin/ObjectFactory.h"

#include "core/Json.h"

void qv_detail::readFactoryDescription(const std::string& description, std::string& name, std::string& param) {
    const std::map<std::string, std::string> items = parseJsonObject(description);
    name.clear();
    jsonObjectItemToNamedValue(items, "name", name);
    const std::map<std::string, std::string>::const_iterator found = items.find("param");
    param = found == items.end() ? std::string() : found->second;
}
