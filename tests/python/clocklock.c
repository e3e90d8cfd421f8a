/* ThreadSanitizer of GCC 12 and before does not see pthread_mutex_clocklock, by which std::timed_mutex waits, and takes
   what the mutex guards for races. Loaded in front of the C library, this one goes by way of a function that it does
   see. `./run sanitize thread` builds it. */
#define _GNU_SOURCE
#include <pthread.h>
#include <time.h>

int pthread_mutex_clocklock(pthread_mutex_t *mutex, clockid_t clock, const struct timespec *until) {
  const long long second = 1000000000;
  struct timespec now, real;
  clock_gettime(clock, &now);
  clock_gettime(CLOCK_REALTIME, &real);
  const long long ns =
      (real.tv_sec + until->tv_sec - now.tv_sec) * second + real.tv_nsec + until->tv_nsec - now.tv_nsec;
  const struct timespec there = {ns / second, ns % second};
  return pthread_mutex_timedlock(mutex, &there);
}
