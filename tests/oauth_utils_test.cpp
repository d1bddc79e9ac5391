#include "oauth_utils.h"

#include "store_test.h"
