// soap_export.h - marks what the shared object exports. Nothing else lives here.
#pragma once

#if defined(__GNUC__)
// Marks an exported function or variable.
#define ZUV_API   __attribute__((visibility("default")))
// Marks an exported class.
#define ZUV_CLASS __attribute__((visibility("default")))
#else
#define ZUV_API
#define ZUV_CLASS
#endif
