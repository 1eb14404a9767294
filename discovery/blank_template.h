// The template that blank profiles are made from: a small version 2 RGB display
// profile, built by the plugin itself, and laid in the temporary folder as "blank.icc".
#ifndef TINTWELL_DISCOVERY_BLANK_TEMPLATE_H
#define TINTWELL_DISCOVERY_BLANK_TEMPLATE_H

#include <cstdint>
#include <vector>

// The template's bytes: header, description, copyright, white point, sRGB colorants
// (D50), gamma 2.2 curves, and lut16 A2B0/B2A0 tables built from the same model.
std::vector<uint8_t> BlankTemplateBytes();

// Writes the template as "blank.icc" into folder (a Windows path ending in a
// backslash) unless a file of that name is there already: a template the user put
// there wins. It is written in stagingFolder, a folder of this program's own on the
// same volume, and moved into place, so it appears whole or not at all and two
// programs starting at once never write the same file. False when it was not placed.
bool PlaceBlankTemplate(const char* folder, const char* stagingFolder);

#endif
