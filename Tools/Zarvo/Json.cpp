#include "Tools/Zarvo/Json.h"

#include "Tools/Zarvo/Text.h"

Json MakeJsonText(std::string_view text) { return ReplaceBrokenUtf8(text); }

void SetJsonPath(Json& object, std::string_view path) {
    object["path"] = MakeJsonText(path);
    if (!IsUtf8(path)) object["pathBytes"] = EncodeBase64(path);
}

void WriteJson(OutputBuffer& output, const Json& object) {
    const std::string line = object.dump();
    output.Write(output.IsTerminal() ? EscapeControlsInJson(line) : line);
    output.Write("\n");
}
