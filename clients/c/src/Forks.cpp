// SPDX-License-Identifier: Apache-2.0
// What becomes of the process's clients when it forks: the child closes its copies of their descriptors, so that it
// doesn't keep a connection open whose owner is gone. Their memory it has not, and their handles are dead.
#include <pthread.h>

#include "clients/c/src/Client.h"

namespace tarn::reporting {

namespace {

pthread_mutex_t mutex = PTHREAD_MUTEX_INITIALIZER;
pthread_once_t once = PTHREAD_ONCE_INIT;
tarnreporting_client* first = nullptr;

void beforeFork() {
  pthread_mutex_lock(&mutex);
  for (tarnreporting_client* client = first; client != nullptr; client = client->nextClient) {
    client->lock();
  }
}

void afterFork() {
  for (tarnreporting_client* client = first; client != nullptr; client = client->nextClient) {
    client->unlock();
  }
  pthread_mutex_unlock(&mutex);
}

void inChild() {
  for (tarnreporting_client* client = first; client != nullptr; client = client->nextClient) {
    client->closeInChild();
  }
  tarnreporting_client* const list = first;
  first = nullptr;  // a later fork of the child has nothing to do with them
  for (tarnreporting_client* client = list; client != nullptr; client = client->nextClient) {
    client->unlock();
  }
  pthread_mutex_unlock(&mutex);
}

void watchForks() {
  pthread_atfork(&beforeFork, &afterFork, &inChild);
}

}  // namespace

void enlist(tarnreporting_client& client) noexcept {
  pthread_once(&once, &watchForks);
  pthread_mutex_lock(&mutex);
  client.nextClient = first;
  first = &client;
  pthread_mutex_unlock(&mutex);
}

void strike(tarnreporting_client& client) noexcept {
  pthread_mutex_lock(&mutex);
  tarnreporting_client** place = &first;
  while (*place != nullptr && *place != &client) {
    place = &(*place)->nextClient;
  }
  if (*place != nullptr) {
    *place = client.nextClient;
  }
  pthread_mutex_unlock(&mutex);
}

}  // namespace tarn::reporting
