#pragma once
// The Automation value types in one include.

#include "AtlException.h"
#include "BStr.h"
#include "BstrT.h"
#include "CComBSTR.h"
#include "ComError.h"
#include "HResult.h"
#include "SafeArray.h"
#include "Variant.h"
#include "VariantT.h"
