#pragma once
// kestcalmorph: converts CDF calibration files between XML and a tree of C++ classes.
// One include for hosts; after `using namespace kest;` every public name is available.

#include "platform/Automation.h"
#include "platform/KestCalmorphDLLError.h"
#include "platform/XmlDom.h"

#include "text/KestCdfDate.h"
#include "text/KestCdfNormalizedString.h"

#include "model/KestCdfAxis.h"
#include "model/KestCdfCalData.h"
#include "model/KestCdfCalItem.h"
#include "model/KestCdfCalItemValue.h"
#include "model/KestCdfCalList.h"
#include "model/KestCdfChange.h"
#include "model/KestCdfChangeHistory.h"
#include "model/KestCdfSymbolicFile.h"
#include "model/KestCdfTargetImage.h"

#include "core/KestCalmorph.h"
