// Worker threads of the command families: plain pthreads stopped through global flags. Every
// thread a handler starts starts here, so each one is counted and held by the exit guard.
#pragma once

#include <atomic>
#include <pthread.h>

// A handle that names no thread.
inline const pthread_t NO_THREAD = static_cast<pthread_t>(-1);

// Starts `body` on a new thread, joinable or detached. 0, or the pthread error (logged); the
// handle goes to `handle` (may be null) only on success.
int start_worker(pthread_t* handle, void (*body)(), bool detached);

// The body of a stream: one cycle per period while `exit` is false (tested before the first
// cycle and after each); a cycle that returns false ends the stream.
void run_stream(const std::atomic<bool>& exit, bool (*cycle)(), unsigned period_us);

// Held by a worker around each cycle's device and port work, never across its sleep. Once the
// process has begun to exit no cycle begins or is left half done: the worker waits there and
// the process ends under it, so no worker touches what exit destroys (the log, the root).
struct WorkerCycle {
  WorkerCycle();
  ~WorkerCycle();
  WorkerCycle(const WorkerCycle&) = delete;
  WorkerCycle& operator=(const WorkerCycle&) = delete;
};

// Workers started and not yet returned; tests wait on it.
int running_workers();

// How threads are created; tests replace it to make creation fail.
using ThreadCreate = int (*)(pthread_t*, const pthread_attr_t*, void* (*)(void*), void*);
extern ThreadCreate worker_thread_create;
