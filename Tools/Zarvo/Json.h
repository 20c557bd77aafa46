// JSON Lines: objects whose keys stay in the order in which they are set, one a line.
#pragma once

#include "Tools/Zarvo/Output.h"

#include <nlohmann/json.hpp>
#include <string_view>

using Json = nlohmann::ordered_json;

// A text as JSON can hold it: U+FFFD for each byte of broken UTF-8.
Json MakeJsonText(std::string_view text);

// Sets "path", and "pathBytes", in base64, for a path that is not UTF-8.
void SetJsonPath(Json& object, std::string_view path);

void WriteJson(OutputBuffer& output, const Json& object);
