// SPDX-License-Identifier: Apache-2.0
#include "host/ogc/cs/joltgeoref.h"

JOLTGeoref::~JOLTGeoref() = default;
