#include "FilterTable.h"

#include <cctype>

namespace tfxtool {

const char* ParamTypeName(ParamType type) {
  switch (type) {
    case ParamType::kInt:
      return "int";
    case ParamType::kDouble:
      return "double";
    case ParamType::kString:
      return "string";
  }
  return "?";
}

// Ranges are what a host's slider offers. Most effects apply their formulas unchecked, so the
// limits keep values where the arithmetic stays meaningful: exposure, brightness and contrast
// diverge well beyond +-100 (brightness divides by zero near -250, contrast at 255), and the lens
// maps only stay inside the frame for +-100.
const std::vector<FilterInfo>& KnownFilters() {
  using P = ParamType;
  static const std::vector<FilterInfo> kFilters = {
      {"18C6E879-4138-42D0-B0B9-6B4401AA97E6",
       "ColorAdjust",
       {},
       "exposure, brightness, contrast, vibrance and saturation, applied in that order",
       {
           {"u_exposure", P::kDouble, 0, -100, 100,
            "exposure: gain 2^(v*0.012), +50 = x1.52, -50 = x0.66"},
           {"u_brightness", P::kDouble, 0, -100, 100,
            "brightness: above 0 scales by 1+v/100 (100 doubles), below 0 subtracts"},
           {"u_contrast", P::kDouble, 0, -100, 100,
            "contrast: above 0 stretches away from mid grey, below 0 flattens"},
           {"u_vib", P::kDouble, 0, -100, 100,
            "vibrance: saturates muted colours more than vivid ones"},
           {"u_sat", P::kDouble, 0, -100, 100,
            "saturation: -100 gives grey, above 0 strengthens every colour"},
       }},
      {"39509FB9-39FB-4516-9464-3D891DD61D62",
       "WhiteBalanceAdjust",
       {},
       "shifts the blue-red and green-magenta balance",
       {
           {"u_temperature", P::kDouble, 0, -100, 100,
            "temperature: above 0 warmer (more red, less blue), below 0 cooler"},
           {"u_tint", P::kDouble, 0, -100, 100,
            "tint: above 0 towards magenta (less green), below 0 towards green"},
           {"u_rgain", P::kDouble, 1, -100, 100, "red gain: accepted, not applied"},
           {"u_ggain", P::kDouble, 1, -100, 100, "green gain: accepted, not applied"},
           {"u_bgain", P::kDouble, 1, -100, 100, "blue gain: accepted, not applied"},
       }},
      {"41AA934B-757A-4EAD-8F7B-85E2E2952B6A",
       "ChromeKeyCombine",
       {},
       "joins a key mask (background) and a colour picture (foreground) into a keyed picture",
       {}},
      {"74EB022D-1D73-4D1E-9F70-487C356D46CD",
       "Lut",
       {"ColorLut3dAdjust"},
       "applies a 3D look-up table file to every pixel",
       {
           {"lut3dPath", P::kString, 0, 0, 0,
            "path of a .cube or .3dl file; ~ and $VAR are expanded"},
       }},
      {"8622FC58-4DF1-44BD-9B37-2F633D4D3368",
       "VignetteAdjust",
       {},
       "darkens or lightens the frame outside a centred ellipse",
       {
           {"amount", P::kDouble, 0, -100, 100,
            "outside the ellipse: -100 black, 0 unchanged, 100 twice as bright"},
           {"size", P::kDouble, 100, 0, 100,
            "size of the clear ellipse: 0 is a fifth of the half-frame"},
           {"roundness", P::kDouble, 0, -100, 100,
            "100 makes the ellipse a circle; 0 and below follow the frame"},
           {"feather", P::kDouble, 50, 0, 100, "width of the soft edge"},
           {"exposure", P::kDouble, 0, -100, 100, "exposure inside the ellipse: gain 2^(v/100)"},
           {"highlights", P::kDouble, 50, 0, 100,
            "tone curve outside: 50 neutral, above lifts dark tones, below deepens them"},
       }},
      {"969C6D5D-43AC-42F9-8F6C-9AB868BA9356",
       "lutAToWhiteEffect",
       {},
       "turns fully transparent pixels opaque black",
       {}},
      {"AF91FF05-6577-4A4B-C81E-652EE7D6596E",
       "HSLAdjust",
       {},
       "hue, saturation and lightness in eight overlapping colour bands",
       {
           {"u_red_hue", P::kDouble, 0, -100, 100,
            "red: shifts its colours along the hue circle, +-100 onto the neighbouring centre"},
           {"u_red_sat", P::kDouble, 0, -100, 100, "red: chroma x (1 + v/100); -100 gives grey"},
           {"u_red_light", P::kDouble, 0, -100, 100,
            "red: +100 blends to white, -100 to black (fading out towards grey)"},
           {"u_red_width", P::kDouble, 0, -100, 100, "red: reach x 2^(v/100)"},
           {"u_red_soft", P::kDouble, 0, -100, 100,
            "red: edge fade; 0 half the edge distance, +100 all of it, -100 nearly hard"},
           {"u_orange_hue", P::kDouble, 0, -100, 100,
            "orange: shifts its colours along the hue circle, +-100 onto the neighbouring centre"},
           {"u_orange_sat", P::kDouble, 0, -100, 100,
            "orange: chroma x (1 + v/100); -100 gives grey"},
           {"u_orange_light", P::kDouble, 0, -100, 100,
            "orange: +100 blends to white, -100 to black (fading out towards grey)"},
           {"u_orange_width", P::kDouble, 0, -100, 100, "orange: reach x 2^(v/100)"},
           {"u_orange_soft", P::kDouble, 0, -100, 100,
            "orange: edge fade; 0 half the edge distance, +100 all of it, -100 nearly hard"},
           {"u_yellow_hue", P::kDouble, 0, -100, 100,
            "yellow: shifts its colours along the hue circle, +-100 onto the neighbouring centre"},
           {"u_yellow_sat", P::kDouble, 0, -100, 100,
            "yellow: chroma x (1 + v/100); -100 gives grey"},
           {"u_yellow_light", P::kDouble, 0, -100, 100,
            "yellow: +100 blends to white, -100 to black (fading out towards grey)"},
           {"u_yellow_width", P::kDouble, 0, -100, 100, "yellow: reach x 2^(v/100)"},
           {"u_yellow_soft", P::kDouble, 0, -100, 100,
            "yellow: edge fade; 0 half the edge distance, +100 all of it, -100 nearly hard"},
           {"u_green_hue", P::kDouble, 0, -100, 100,
            "green: shifts its colours along the hue circle, +-100 onto the neighbouring centre"},
           {"u_green_sat", P::kDouble, 0, -100, 100,
            "green: chroma x (1 + v/100); -100 gives grey"},
           {"u_green_light", P::kDouble, 0, -100, 100,
            "green: +100 blends to white, -100 to black (fading out towards grey)"},
           {"u_green_width", P::kDouble, 0, -100, 100, "green: reach x 2^(v/100)"},
           {"u_green_soft", P::kDouble, 0, -100, 100,
            "green: edge fade; 0 half the edge distance, +100 all of it, -100 nearly hard"},
           {"u_aqua_hue", P::kDouble, 0, -100, 100,
            "aqua: shifts its colours along the hue circle, +-100 onto the neighbouring centre"},
           {"u_aqua_sat", P::kDouble, 0, -100, 100, "aqua: chroma x (1 + v/100); -100 gives grey"},
           {"u_aqua_light", P::kDouble, 0, -100, 100,
            "aqua: +100 blends to white, -100 to black (fading out towards grey)"},
           {"u_aqua_width", P::kDouble, 0, -100, 100, "aqua: reach x 2^(v/100)"},
           {"u_aqua_soft", P::kDouble, 0, -100, 100,
            "aqua: edge fade; 0 half the edge distance, +100 all of it, -100 nearly hard"},
           {"u_blue_hue", P::kDouble, 0, -100, 100,
            "blue: shifts its colours along the hue circle, +-100 onto the neighbouring centre"},
           {"u_blue_sat", P::kDouble, 0, -100, 100, "blue: chroma x (1 + v/100); -100 gives grey"},
           {"u_blue_light", P::kDouble, 0, -100, 100,
            "blue: +100 blends to white, -100 to black (fading out towards grey)"},
           {"u_blue_width", P::kDouble, 0, -100, 100, "blue: reach x 2^(v/100)"},
           {"u_blue_soft", P::kDouble, 0, -100, 100,
            "blue: edge fade; 0 half the edge distance, +100 all of it, -100 nearly hard"},
           {"u_purple_hue", P::kDouble, 0, -100, 100,
            "purple: shifts its colours along the hue circle, +-100 onto the neighbouring centre"},
           {"u_purple_sat", P::kDouble, 0, -100, 100,
            "purple: chroma x (1 + v/100); -100 gives grey"},
           {"u_purple_light", P::kDouble, 0, -100, 100,
            "purple: +100 blends to white, -100 to black (fading out towards grey)"},
           {"u_purple_width", P::kDouble, 0, -100, 100, "purple: reach x 2^(v/100)"},
           {"u_purple_soft", P::kDouble, 0, -100, 100,
            "purple: edge fade; 0 half the edge distance, +100 all of it, -100 nearly hard"},
           {"u_magenta_hue", P::kDouble, 0, -100, 100,
            "magenta: shifts its colours along the hue circle, +-100 onto the neighbouring centre"},
           {"u_magenta_sat", P::kDouble, 0, -100, 100,
            "magenta: chroma x (1 + v/100); -100 gives grey"},
           {"u_magenta_light", P::kDouble, 0, -100, 100,
            "magenta: +100 blends to white, -100 to black (fading out towards grey)"},
           {"u_magenta_width", P::kDouble, 0, -100, 100, "magenta: reach x 2^(v/100)"},
           {"u_magenta_soft", P::kDouble, 0, -100, 100,
            "magenta: edge fade; 0 half the edge distance, +100 all of it, -100 nearly hard"},
       }},
      {"CFAAD60B-AC2B-4B39-A8E1-D25E35A6F735",
       "DistortionFringingAdjust",
       {},
       "simulates or corrects lens distortion and colour fringing",
       {
           {"distortion", P::kDouble, 0, -100, 100,
            "above 0 bulges the centre (barrel), below 0 pinches it (pincushion)"},
           {"fringing", P::kDouble, 0, -100, 100,
            "red and blue drift apart towards the edges, 3% of the radius at 100"},
       }},
      {"D8651B53-F47A-4B98-B8E9-35B491D5EADC",
       "LightAdjust",
       {},
       "highlights, shadows, white and black levels on one tone curve",
       {
           {"u_highLight", P::kDouble, 0, -100, 100,
            "highlights: brightens (or darkens) pixels by their brightest channel"},
           {"u_shadow", P::kDouble, 0, -100, 100,
            "shadows: lifts (or deepens) dark pixels; the lift is 4x the cut"},
           {"u_whiteLevel", P::kDouble, 0, -100, 100,
            "white level: moves the bright end; above 0 applies the curve twice"},
           {"u_blackLevel", P::kDouble, 0, -100, 100,
            "black level: moves the dark end; below 0 is 4x stronger"},
       }},
      {"DB4BBA18-48FC-4164-B572-E59757B02796",
       "ChromeKeyLut3dCL",
       {"ChromeKeyLut3d"},
       "chroma key through generated 3D LUTs: a key mask or the corrected colours",
       {
           {"red", P::kInt, 0, 0, 255, "key colour, red"},
           {"green", P::kInt, 0, 0, 255, "key colour, green"},
           {"blue", P::kInt, 0, 0, 255, "key colour, blue"},
           {"contrast", P::kDouble, 50, 0, 100, "hardness of the key's edge"},
           {"offset", P::kDouble, 0, -100, 100, "moves the key threshold"},
           {"mode", P::kInt, 0, 0, 1, "0 writes the key mask, 1 the corrected colours"},
       }},
  };
  return kFilters;
}

bool EqualsNoCase(const std::string& a, const std::string& b) {
  if (a.size() != b.size()) return false;
  for (size_t i = 0; i < a.size(); ++i) {
    if (std::tolower(static_cast<unsigned char>(a[i])) !=
        std::tolower(static_cast<unsigned char>(b[i])))
      return false;
  }
  return true;
}

const FilterInfo* FindFilterByGuid(const std::string& guid) {
  for (const FilterInfo& f : KnownFilters()) {
    if (EqualsNoCase(f.guid, guid)) return &f;
  }
  return nullptr;
}

const FilterInfo* FindFilterByName(const std::string& name) {
  for (const FilterInfo& f : KnownFilters()) {
    if (EqualsNoCase(f.name, name)) return &f;
    for (const char* alias : f.aliases) {
      if (EqualsNoCase(alias, name)) return &f;
    }
  }
  return nullptr;
}

}  // namespace tfxtool
