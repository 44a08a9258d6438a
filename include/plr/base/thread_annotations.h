#pragma once

// Clang's thread-safety attributes under our names. A queue role is a
// capability: state that only the queue may touch is PLR_CONFINED_TO(role_),
// members that run there are PLR_ON(role_). Other compilers see nothing.
// Reference: clang documentation, "Thread Safety Analysis".
#if defined(__clang__)
#define PLR_ATTRIBUTE(x) __attribute__((x))
#else
#define PLR_ATTRIBUTE(x)
#endif

#define PLR_CAPABILITY(name) PLR_ATTRIBUTE(capability(name))
#define PLR_SCOPED_CAPABILITY PLR_ATTRIBUTE(scoped_lockable)
#define PLR_GUARDED_BY(mutex) PLR_ATTRIBUTE(guarded_by(mutex))
#define PLR_CONFINED_TO(role) PLR_ATTRIBUTE(guarded_by(role))
#define PLR_ON(role) PLR_ATTRIBUTE(requires_capability(role))
#define PLR_REQUIRES(mutex) PLR_ATTRIBUTE(requires_capability(mutex))
#define PLR_ACQUIRE(...) PLR_ATTRIBUTE(acquire_capability(__VA_ARGS__))
#define PLR_TRY_ACQUIRE(...) PLR_ATTRIBUTE(try_acquire_capability(__VA_ARGS__))
#define PLR_RELEASE(...) PLR_ATTRIBUTE(release_capability(__VA_ARGS__))
#define PLR_RETURN_CAPABILITY(x) PLR_ATTRIBUTE(lock_returned(x))
#define PLR_EXCLUDES(mutex) PLR_ATTRIBUTE(locks_excluded(mutex))
#define PLR_ASSERT_CAPABILITY(x) PLR_ATTRIBUTE(assert_capability(x))
#define PLR_NO_THREAD_SAFETY_ANALYSIS PLR_ATTRIBUTE(no_thread_safety_analysis)
