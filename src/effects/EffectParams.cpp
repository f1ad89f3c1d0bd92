#include "effects/EffectParams.h"

void RegisterCatalogParams(NLEFilterInfoComPtr& d, const tfx::catalog::Filter& filter) {
  for (const tfx::catalog::Param& p : filter.params) {
    if (p.type == tfx::catalog::ParamType::kInt) {
      d.AddParam<int>(p.wideName, NLEFilterPropertyType_Int, static_cast<int>(p.defaultValue),
                      static_cast<int>(p.min), static_cast<int>(p.max), static_cast<int>(p.step),
                      p.wideName, 0);
    } else if (p.type == tfx::catalog::ParamType::kDouble) {
      d.AddParam<double>(p.wideName, NLEFilterPropertyType_Double, p.defaultValue, p.min, p.max,
                         p.step, p.wideName, 0);
    }
  }
}
