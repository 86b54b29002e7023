#pragma once
// The XML DOM service: every interface in one include.

#include "IXMLDOMDocument.h"
#include "IXMLDOMNamedNodeMap.h"
#include "IXMLDOMNode.h"
#include "IXMLDOMNodeList.h"
#include "IXMLDOMParseError.h"
#include "IXMLDOMSchemaCollection.h"
