// SPDX-License-Identifier: Apache-2.0
#ifndef KSP_KSP_H
#define KSP_KSP_H

/* The whole of libksp for C and C++ callers. */

#include "ksp/connection.h"
#include "ksp/context.h"
#include "ksp/error.h"
#include "ksp/exporter.h"
#include "ksp/media_statistics.h"
#include "ksp/numbers.h"
#include "ksp/snapshot.h"
#include "ksp/statistics.h"

#endif
