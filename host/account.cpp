// Byte accounts of pools and host, and the host's list of live pools.
#include "host/core.hpp"

namespace sm::host {

bool has_room(PoolHead& pool, std::uint64_t bytes) {
  if (pool.account.has_room_for(bytes) && pool.host->account.has_room_for(bytes)) return true;
  pool.host->ceiling_met = true;
  return false;
}

void charge(PoolHead& pool, std::uint64_t bytes) {
  pool.account.add(bytes);
  pool.host->account.add(bytes);
}

void refund(PoolHead& pool, std::uint64_t bytes) {
  pool.account.subtract(bytes);
  pool.host->account.subtract(bytes);
}

void enlist(PoolHead& pool, QxHost& host) {
  pool.host = &host;
  pool.next = host.pools;
  if (host.pools) host.pools->previous = &pool;
  host.pools = &pool;
  ++host.pools_live;
}

void retire(PoolHead& pool) {
  QxHost& host = *pool.host;
  host.account.subtract(pool.account.in_use);
  pool.account.in_use = 0;
  if (pool.next) pool.next->previous = pool.previous;
  (pool.previous ? pool.previous->next : host.pools) = pool.next;
  pool.previous = pool.next = nullptr;
  --host.pools_live;
}

}  // namespace sm::host
