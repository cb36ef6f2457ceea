/* A management host, as small as one can be. */
#pragma once

typedef struct Order {
  const char* server; /* dotted address */
  const char* port;
  const char* list; /* the list file, as the server knows it */
  const char* crc;  /* its CRC-32, unsigned decimal */
} Order;

/*
 * Walks one job through the configlet and waits until the upgrade has told how it ended, printing
 * every status.
 *
 * returns 1 when it ended well, 0 when it was refused or failed
 */
int CarryOut(const Order* order);

/* Waits a little; what the platform calls that. Called while the upgrade runs. */
void Pause(void);
