// instances.h - the one thing that the context's end does with instances besides the public operations.
#pragma once

#include <zuv_client_pro/soap.h>

// Takes back all instance records without destroying their objects.
void instance_records_release(soap *ctx);
