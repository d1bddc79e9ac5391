#include "oauth_db_basic.h"

#include "store_test.h"
