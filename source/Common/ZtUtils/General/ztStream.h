#pragma once

// Binary serialisation, in two layers.
//
// Byte streams move bytes and may carry named sub-streams: IztStream, IztStream2, IztStream3, with
// CztFileStream over a file and CztMemoryStream over a heap block. Typed streams, CztOutStream and
// CztInStream, put a version header in front and write or read values in the writer's byte order.
// docs/stream-format.md documents the bytes.
//
// A stream belongs to one thread at a time; only reference counts may change from any thread.

#include "source/Common/ZtUtils/General/CztFileStream.h"
#include "source/Common/ZtUtils/General/CztMemoryStream.h"
#include "source/Common/ZtUtils/General/ztStreamException.h"
#include "source/Common/ZtUtils/General/ztStreamInterfaces.h"
#include "source/Common/ZtUtils/General/ztTypedStream.h"
