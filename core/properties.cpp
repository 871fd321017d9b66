#include "core/properties.h"

#include <cutils/properties.h>
#include <string.h>

namespace corvexd {

bool property_is(const char* name, const char* wanted, const char* default_value) {
  char value[PROPERTY_VALUE_MAX];
  property_get(name, value, default_value);
  return strcmp(value, wanted) == 0;
}

}  // namespace corvexd
