#pragma once

// The part of the platform's system property header that <cutils/properties.h> builds on.

#define PROP_NAME_MAX 32
#define PROP_VALUE_MAX 92
