// torture.h - refuses one allocation of the library in a whole process, chosen from outside by script/torture.
//
// Only in a build with ZUV_SHARED_OBJECTS, where the library is a shared object and its calls can be distinguished
// from those of a test or of GoogleTest: an allocation belongs to the library if the innermost function that
// is the library's or the program's, below the C++ runtime, is the library's. In zuv-service its own are
// meant as well. It is inert without the environment:
//   ZUV_TORTURE_REPORT   file to append to; nothing happens without
//   ZUV_TORTURE_PROGRAM  name of the program meant; others, such as a peer that a test starts, are left alone
//   ZUV_TORTURE_NTH      number of the allocation to refuse; 0 or absent: none
//   ZUV_TORTURE_PATHS    set: a line for each new way that leads to an allocation
//
// Lines of the report: "path N KEY", "refused SITE", "leaked COUNT SITE", "crash SIGNAL SITE...", and at the
// end "asked N". A block counts as leaked if it was handed to the library and is there when the program ends.
#pragma once

namespace torture {

// Whether this allocation, which `caller` asks for, is the one to refuse; errno is set then.
// given: notes a block that `caller` was given, and returns it. taken_back: that it is about to be freed.
#ifdef ZUV_SHARED_OBJECTS
bool refuses(const void *caller);
void *given(void *block, const void *caller);
void taken_back(void *block);
#else
inline bool refuses(const void *)
{
    return false;
}
inline void *given(void *block, const void *)
{
    return block;
}
inline void taken_back(void *) {}
#endif

} // namespace torture
