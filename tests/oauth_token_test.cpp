#include "oauth_token.h"

#include "store_test.h"
