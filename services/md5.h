// MD5 (RFC 1321) over the factory library's MD5_CTX.
#pragma once

#include <cstddef>

#include "services/factory_support.h"

void md5_update(MD5_CTX* context, const void* data, size_t size);
