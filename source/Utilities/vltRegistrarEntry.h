#pragma once

#include "source/Common/vltInterfaces.h"

// Makes the locks of the registrar's entry, so that the first call finds them.
void vlPrepareRegistrarEntry();

// vltGetRegistrar of the installed library, reached by name, for code that is not linked with it.
// E_FAIL if the library or the entry is not there.
HRESULT vltGetRegistrarDynamically(IvltRegistrar** out);
