// sarn: the client library of the Kerno service. Include this one header for everything.
#pragma once

#include "vek/Vek.h"
#include "wynbaselib/Bytestream.h"
#include "wynbaselib/Gzip.h"

#include "sarn/Export.h"
#include "sarn/GeneratedSupport.h"
#include "sarn/SarnObject.h"
#include "sarn/Schema.h"
#include "sarn/StructInfoMap.h"
#include "sarn/Version.h"
#include "sarn/ByteBuffer.h"
#include "sarn/Json.h"
#include "sarn/Base64.h"
#include "sarn/Dict.h"
#include "sarn/ScalarTypes.h"
#include "sarn/StringUtil.h"
#include "sarn/ObjectIdAndType.h"
#include "sarn/SarnHashTable.h"
#include "sarn/SarnUtil.h"
#include "sarn/RpcV2Parser.h"
#include "sarn/Limits.h"
#include "sarn/DictValue.h"
#include "sarn/Dictionary.h"
#include "sarn/JsonParser.h"
#include "sarn/LazyDict.h"
#include "sarn/FieldAccess.h"
#include "sarn/JsonSarnObject.h"
#include "sarn/DictionarySarnObject.h"

// Every generated schema class (namespace sarnschema), from the build tree.
#include "schema/sarn-schema.h"
