// The sizes of a system property, as bionic's header of this name gives them; <cutils/properties.h>
// includes it.
#pragma once

#define PROP_NAME_MAX 32
#define PROP_VALUE_MAX 92
