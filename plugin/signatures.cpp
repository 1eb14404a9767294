#include "signatures.h"

#include "host_bridge.h"

uint32_t TagFromString(REALstring text) {
  const char* bytes = bridge::StringText(text);
  const int32_t length = bridge::StringLength(text);
  uint32_t signature = 0;
  for (int32_t i = 0; i < 4; ++i)
    signature = signature << 8 | (i < length ? static_cast<uint8_t>(bytes[i]) : 0u);
  return signature;
}

REALstring TagToString(uint32_t signature) {
  const char text[4] = {static_cast<char>(signature >> 24), static_cast<char>(signature >> 16),
                        static_cast<char>(signature >> 8), static_cast<char>(signature)};
  return bridge::BuildString(text, 4);
}
