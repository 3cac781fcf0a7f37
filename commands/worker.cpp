#include "commands/worker.h"

#include <atomic>
#include <cstdlib>
#include <mutex>
#include <unistd.h>

#include "core/log.h"

namespace {

// Writer-preferring, so a steady stream of cycles cannot keep the exit waiting. Never
// destroyed: workers may still wait on it while the process ends.
pthread_rwlock_t g_cycle_lock = PTHREAD_RWLOCK_WRITER_NONRECURSIVE_INITIALIZER_NP;
std::atomic<int> g_running{0};

// Registered after every global it protects was constructed, so it runs before their
// destructors. The lock is never released.
void hold_cycles_at_exit() { pthread_rwlock_wrlock(&g_cycle_lock); }

void* run_worker(void* arg) {
  const auto body = reinterpret_cast<void (*)()>(arg);
  body();
  g_running.fetch_sub(1);
  return nullptr;
}

}  // namespace

ThreadCreate worker_thread_create = pthread_create;

WorkerCycle::WorkerCycle() { pthread_rwlock_rdlock(&g_cycle_lock); }
WorkerCycle::~WorkerCycle() { pthread_rwlock_unlock(&g_cycle_lock); }

int start_worker(pthread_t* handle, void (*body)(), bool detached) {
  static std::once_flag registered;
  std::call_once(registered, [] { std::atexit(hold_cycles_at_exit); });
  pthread_attr_t attr;
  pthread_attr_init(&attr);
  if (detached) pthread_attr_setdetachstate(&attr, PTHREAD_CREATE_DETACHED);
  g_running.fetch_add(1);
  pthread_t thread;
  const int error = worker_thread_create(&thread, &attr, run_worker, reinterpret_cast<void*>(body));
  pthread_attr_destroy(&attr);
  if (error != 0) {
    g_running.fetch_sub(1);
    ATCI_LOGE("pthread_create failed: %d", error);
    return error;
  }
  if (handle != nullptr) *handle = thread;
  return 0;
}

void run_stream(const std::atomic<bool>& exit, bool (*cycle)(), unsigned period_us) {
  while (!exit) {
    if (!cycle()) return;
    ::usleep(period_us);
  }
}

int running_workers() { return g_running.load(); }
