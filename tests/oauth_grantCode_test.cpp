#include "oauth_grantCode.h"

#include "store_test.h"
