// One TessaroFx frei0r module: the bridge, bound to the filter this module was built for.
#include "Frei0rBridge.h"

#ifndef TFX_FREI0R_SLUG
#error "TFX_FREI0R_SLUG names the catalogued filter of this module"
#endif

namespace tfx::frei0r {
extern const char kModuleSlug[] = TFX_FREI0R_SLUG;
}
