// The same layout as in C.
#include "tests/sdk/interface/RecordLayout.h"
