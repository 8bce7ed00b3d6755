/* What one Process may spend on wrapper chains. Every document below the player's own comes from
 * a third-party ad server, so the work, memory and time a chain may cost are bounded in
 * proportion to what the player handed over. The parameters are set with the table's SetParam
 * on a handle, like those of "ka/vmap_parser_api.h", and apply from the next Process on; a player
 * that never sets them keeps the defaults below. */
#ifndef KA_CHAIN_LIMITS_H
#define KA_CHAIN_LIMITS_H

/* Bytes all wrapped documents of one Process may weigh together, passed as the pointer-sized
 * value itself; 0 restores the default. Once spent, the remaining wrappers stay as parsed, as
 * after a failed fetch. GetParam writes a uint64_t. */
#define KA_PID_VMAP_FETCH_BYTES 0x44000101u
#define KA_VMAP_DEFAULT_FETCH_BYTES (16u << 20) /* what two documents of the largest size weigh */

/* Milliseconds one Process may spend on downloads, all chains together, passed as the
 * pointer-sized value itself; 0 (the default) sets no deadline. A download under way when it
 * passes ends within one poll of the source (20 ms), and later wrappers are not fetched.
 * GetParam writes a uint32_t. */
#define KA_PID_VMAP_DEADLINE_MS 0x44000102u

/* The URL the player's own document came from (char*, copied; null clears it, the default).
 * Relative and scheme-relative VASTAdTagURI references of that document resolve against it, and
 * those of each fetched document against the URL it was finally fetched from; without it a
 * relative reference of the player's document reaches the source-IO module as written. A
 * document that came over http or https may name only http and https documents. GetParam
 * writes the handle's copy (char*, null when unset). */
#define KA_PID_VMAP_BASE_URL 0x44000103u

/* Wrapped documents one ad of the player's document may fetch along its chain, all depths
 * together (in VMAP, each ad of each inline VAST element): a straight chain of ten plus room for
 * fan-out. The total stays linear in the player's document. */
#define KA_VMAP_FETCHES_PER_AD 32u

/* Merging copies a wrapper's tracking into the ad it leads to, every Linear creative of the
 * wrapper into every Linear creative of the InLine. The copies one Process may make weigh at
 * most KA_VMAP_MERGE_BYTES_FLOOR plus KA_VMAP_MERGE_BYTES_PER_PARSED_BYTE times the bytes of
 * all documents it parsed (records and strings counted); past that, further copies are skipped
 * and the log says so once. */
#define KA_VMAP_MERGE_BYTES_FLOOR (1u << 20)
#define KA_VMAP_MERGE_BYTES_PER_PARSED_BYTE 8u

#endif /* KA_CHAIN_LIMITS_H */
