// sarn: the client library of the Kerno service. Include this one header for everything.
// The runtime's folders, in the order in which they may include each other: base, model,
// values, dict, objects, json, binary, rpc.
#pragma once

#include "vek/Vek.h"
#include "wynbaselib/Bytestream.h"
#include "wynbaselib/Gzip.h"

#include "sarn/base/Export.h"
#include "sarn/base/Limits.h"
#include "sarn/base/Version.h"

#include "sarn/model/FieldAccess.h"
#include "sarn/model/SarnHashTable.h"
#include "sarn/model/SarnObject.h"
#include "sarn/model/Schema.h"
#include "sarn/model/StructInfoMap.h"

#include "sarn/values/Base64.h"
#include "sarn/values/ByteBuffer.h"
#include "sarn/values/Json.h"
#include "sarn/values/LongId.h"
#include "sarn/values/ObjectIdAndType.h"
#include "sarn/values/SarnUtil.h"
#include "sarn/values/ScalarTypes.h"
#include "sarn/values/StringUtil.h"

#include "sarn/dict/Dict.h"
#include "sarn/dict/DictValue.h"
#include "sarn/dict/Dictionary.h"
#include "sarn/dict/LazyDict.h"

#include "sarn/objects/DictionarySarnObject.h"
#include "sarn/objects/GeneratedSupport.h"

#include "sarn/json/JsonParser.h"
#include "sarn/json/JsonSarnObject.h"

#include "sarn/binary/GoogleInt.h"
#include "sarn/binary/ProtoBuf.h"
#include "sarn/binary/ProtoBufByteOutputStream.h"

#include "sarn/rpc/KernoRpcV2.h"
#include "sarn/rpc/KernoRpcV2BytestreamImpl.h"
#include "sarn/rpc/KernoRpcV2Packetizer.h"
#include "sarn/rpc/KernoRpcWrapper.h"
#include "sarn/rpc/RpcV2Parser.h"

// Every generated schema class (namespace sarnschema), from the build tree.
#include "schema/sarn-schema.h"
