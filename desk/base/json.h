#ifndef QVTESTER_DESK_BASE_JSON_H_
#define QVTESTER_DESK_BASE_JSON_H_

#include <nlohmann/json.hpp>

namespace qv {

using Json = nlohmann::ordered_json;

}  // namespace qv

#endif  // QVTESTER_DESK_BASE_JSON_H_
