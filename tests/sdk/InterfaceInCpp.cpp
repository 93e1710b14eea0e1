// The same layout as in C.
#include "tests/sdk/RecordLayout.h"
