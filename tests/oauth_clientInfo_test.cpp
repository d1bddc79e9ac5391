#include "oauth_clientInfo.h"

#include "store_test.h"
