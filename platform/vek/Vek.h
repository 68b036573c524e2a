// The platform core stand-in: everything in one include.
#pragma once

#include "vek/VekArray.h"
#include "vek/VekByteString.h"
#include "vek/VekCore.h"
#include "vek/VekHash.h"
#include "vek/VekMempool.h"
#include "vek/VekServices.h"
#include "vek/VekSpinLock.h"
#include "vek/VekString.h"
