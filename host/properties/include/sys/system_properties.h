// Copyright (C) 2026 The vyrservice Authors
// SPDX-License-Identifier: Apache-2.0

#pragma once

// The part of the platform's system property header that <cutils/properties.h> builds on.

#define PROP_NAME_MAX 32
#define PROP_VALUE_MAX 92
