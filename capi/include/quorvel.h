/*
 * libquorvel: calls the services of a device, observes its notifications, and reads and makes the values they carry.
 *
 * Plain C (C11 or later, or C++11 or later); link with -lquorvel. The library starts no thread, installs no signal
 * handler, never ends the process and lets no exception out: when memory runs out, a function reports it like any other
 * failure. Descriptors that it opens are closed on exec.
 *
 * Handles. quorvel_value, quorvel_client, quorvel_call and quorvel_observer are opaque. A handle that a function
 * returns belongs to the caller, who gives it back to the `_free` function of its type, which takes NULL as well. A
 * pointer to a `const quorvel_value` is lent instead, and its function says for how long.
 *
 * Errors. A function that can fail in several ways returns a `quorvel_code` as an int, QUORVEL_OK (0) when all went
 * well. When it takes a `quorvel_error *`, it sets that where it fails, and leaves it alone where it does not; NULL is
 * allowed.
 *
 * Threads. Different handles may be used by different threads at once, even where they are copies of one value. One
 * handle may be read by several threads at once; whoever changes it, steps it or frees it must be alone with it.
 *
 * Texts are UTF-8. A text parameter ends with a zero byte unless its length is given beside it.
 */
#ifndef QUORVEL_H
#define QUORVEL_H

#include <stdbool.h>
#include <stddef.h>
#include <stdint.h>

#if defined(__GNUC__)
#define QUORVEL_API __attribute__((visibility("default")))
#else
#define QUORVEL_API
#endif

#ifdef __cplusplus
extern "C" {
#endif

/* The library's version, such as "1.0.0". It lives as long as the process. Any thread. */
QUORVEL_API const char* quorvel_version(void);

/* How a function ended. */
typedef enum quorvel_code {
  QUORVEL_OK = 0,
  QUORVEL_INVALID_ROOT = 1,     /* the device root is no absolute path of a directory */
  QUORVEL_SERVICE_ABSENT = 2,   /* nobody serves the socket: the service is not started */
  QUORVEL_ACCESS_DENIED = 3,    /* the socket's mode or owner keeps the caller out */
  QUORVEL_INVALID_ARGUMENT = 4, /* an argument of the function is not what it takes */
  QUORVEL_TIMED_OUT = 5,        /* the time limit passed first */
  QUORVEL_DISCONNECTED = 6,     /* the service ended the connection first */
  QUORVEL_PROTOCOL_ERROR = 7,   /* the service sent bytes that are not of the protocol, or more than the limit */
  QUORVEL_SERVICE_FAILURE = 8,  /* the service answered with an error of its own: see `service_code` */
  QUORVEL_SYSTEM_FAILURE = 9,   /* the machine refused memory, a descriptor, or the use of a connection */
  QUORVEL_NOT_YET = 10          /* no failure: poll the descriptor and step again */
} quorvel_code;

/* Why it failed. */
typedef struct quorvel_error {
  int32_t code;         /* a quorvel_code; a later version may add some */
  int32_t service_code; /* the service's own, with QUORVEL_SERVICE_FAILURE; else 0 */
  char sentence[504];   /* for a person; control characters are escaped */
} quorvel_error;

/*
 * A value: a boolean, integer, real, date, string, data, array or dictionary. NULL stands for "no value", and every
 * function that reads a value takes it as one of the kind QUORVEL_NONE.
 *
 * Values behave like numbers do: a change made through one handle is seen through that handle only. Copies share what
 * they can, so copying takes the same short time for every value.
 */
typedef struct quorvel_value quorvel_value;

typedef enum quorvel_kind {
  QUORVEL_NONE = 0,
  QUORVEL_BOOLEAN = 1,
  QUORVEL_INTEGER = 2,
  QUORVEL_REAL = 3,
  QUORVEL_DATE = 4,
  QUORVEL_STRING = 5,
  QUORVEL_DATA = 6,
  QUORVEL_ARRAY = 7,
  QUORVEL_DICTIONARY = 8
} quorvel_kind;

/* Make a value, which the caller frees. NULL when memory runs out, which cannot happen to a boolean. Any thread. */
QUORVEL_API quorvel_value* quorvel_boolean_new(bool boolean);
QUORVEL_API quorvel_value* quorvel_integer_new(int64_t integer);
QUORVEL_API quorvel_value* quorvel_unsigned_new(uint64_t integer);
QUORVEL_API quorvel_value* quorvel_real_new(double real);
/* `seconds` since 2001-01-01T00:00:00Z. */
QUORVEL_API quorvel_value* quorvel_date_new(double seconds);
/* A copy of `text`. NULL also when it is NULL, no valid UTF-8, or 4 GiB or longer. */
QUORVEL_API quorvel_value* quorvel_string_new(const char* text);
/* The same of `length` bytes, zero bytes among them included. */
QUORVEL_API quorvel_value* quorvel_string_new_with_length(const char* text, size_t length);
/* A copy of `length` bytes. NULL also when `bytes` is NULL and `length` is not 0, or for 4 GiB or more. */
QUORVEL_API quorvel_value* quorvel_data_new(const void* bytes, size_t length);
/* Empty containers. */
QUORVEL_API quorvel_value* quorvel_array_new(void);
QUORVEL_API quorvel_value* quorvel_dictionary_new(void);

/* A copy of `value`, which the caller frees; NULL for NULL. It cannot fail. Any thread. */
QUORVEL_API quorvel_value* quorvel_value_copy(const quorvel_value* value);

/* Ends `value`, and with it everything lent from it. Any thread. */
QUORVEL_API void quorvel_value_free(quorvel_value* value);

/* The kind of `value`; a later version adds none. */
QUORVEL_API quorvel_kind quorvel_value_kind(const quorvel_value* value);

/* True when both are of the same kind and have the same content, in depth. The order of a dictionary's entries does not
 * count; reals and dates are compared bit by bit. Two values nested deeper than 512 containers are never equal. */
QUORVEL_API bool quorvel_value_equal(const quorvel_value* left, const quorvel_value* right);

/* Read a value. False, and `result` as it was, when it is of another kind, or an integer outside the range of the
 * result. `result` must not be NULL. */
QUORVEL_API bool quorvel_boolean_get(const quorvel_value* value, bool* result);
QUORVEL_API bool quorvel_integer_get(const quorvel_value* value, int64_t* result);
QUORVEL_API bool quorvel_unsigned_get(const quorvel_value* value, uint64_t* result);
QUORVEL_API bool quorvel_real_get(const quorvel_value* value, double* result);
/* Seconds since 2001-01-01T00:00:00Z. */
QUORVEL_API bool quorvel_date_get(const quorvel_value* value, double* result);

/* The bytes of a string, without a zero byte at the end, and their number in `length`; NULL, and 0, for another kind.
 * Lent until the value is freed. `length` must not be NULL. */
QUORVEL_API const char* quorvel_string_get(const quorvel_value* value, size_t* length);

/* Copies a string into `buffer` of `size` bytes and ends it with a zero byte; a string that does not fit is cut at a
 * character. Returns the string's whole length in bytes, and 0 for another kind, for which it writes an empty text.
 * With `size` 0 nothing is written, and `buffer` may be NULL. */
QUORVEL_API size_t quorvel_string_copy(const quorvel_value* value, char* buffer, size_t size);

/* The bytes of a data value and their number in `length`; NULL, and 0, for another kind. Lent until the value is freed.
 * `length` must not be NULL. */
QUORVEL_API const void* quorvel_data_get(const quorvel_value* value, size_t* length);

/* The number of elements of an array or of entries of a dictionary; 0 for another kind. */
QUORVEL_API size_t quorvel_value_count(const quorvel_value* value);

/* Element `index` of an array; NULL when there is none. Lent until the array is changed or freed. */
QUORVEL_API const quorvel_value* quorvel_array_get(const quorvel_value* array, size_t index);

/* The value under `key` of a dictionary; NULL when there is none. Lent until the dictionary is changed or freed. */
QUORVEL_API const quorvel_value* quorvel_dictionary_get(const quorvel_value* dictionary, const char* key);

/* Walks over the entries of a dictionary: start with `*position` 0, and call until it returns false. Each call sets
 * `*key`, a string, and `*value`, both lent until the dictionary is changed or freed; either pointer may be NULL. The
 * order is that of the encoding the dictionary came from, then that in which entries were added. False for another
 * kind. The dictionary must not change meanwhile. */
QUORVEL_API bool quorvel_dictionary_next(const quorvel_value* dictionary, size_t* position, const quorvel_value** key,
                                         const quorvel_value** value);

/*
 * Change the array or dictionary behind `container`, which may become another handle: what was lent from it ends. Each
 * takes `value` over, whether it succeeds or not; to keep it, hand in a copy. They return
 *
 *   QUORVEL_OK
 *   QUORVEL_INVALID_ARGUMENT  the container is of another kind, the key is NULL or no valid UTF-8, or `value` is NULL
 *                             (as it is when making it failed)
 *   QUORVEL_SYSTEM_FAILURE    memory ran out
 *
 * and leave the container as it was where they fail.
 */
/* Adds `value` behind the last element. */
QUORVEL_API int quorvel_array_append(quorvel_value** container, quorvel_value* value);
/* Stores `value` under a copy of `key`, in the place of an older one. */
QUORVEL_API int quorvel_dictionary_set(quorvel_value** container, const char* key, quorvel_value* value);
/* Takes the entry under `key` out. It is no failure when there is none. */
QUORVEL_API int quorvel_dictionary_remove(quorvel_value** container, const char* key);

/* Reads the binary encoding that takes up all of `bytes`. The value is the caller's and does not refer to the bytes.
 * NULL when they are not valid, whatever is wrong with them, or memory runs out. Any thread. */
QUORVEL_API quorvel_value* quorvel_value_decode(const void* bytes, size_t length);

/* The binary encoding of `value`: a data value, which the caller frees. Equal values give equal bytes. NULL for no
 * value, for one that is nested deeper than 512 containers, and when memory runs out. Any thread. */
QUORVEL_API quorvel_value* quorvel_value_encode(const quorvel_value* value);

/* Writes a description of `value` for a person to read into `buffer` of `size` bytes: one line, ended with a zero byte,
 * cut at a character where it does not fit. Returns the number of bytes written but for the zero byte. */
QUORVEL_API size_t quorvel_value_describe(const quorvel_value* value, char* buffer, size_t size);

/* Whom to call and how long to wait. A client holds no connection: each call and each observer makes its own. */
typedef struct quorvel_client quorvel_client;

/* A client of the daemon with a time limit of 10 seconds, which the caller frees; NULL when memory runs out. */
QUORVEL_API quorvel_client* quorvel_client_new(void);
/* Ends the client. Its calls and observers go on. */
QUORVEL_API void quorvel_client_free(quorvel_client* client);

/* Sets the directory that stands for the device's "/", an absolute path, which is copied. NULL, as at first: the one
 * that the environment variable QUORVEL_ROOT names when a call begins, else "/". Returns QUORVEL_OK, or
 * QUORVEL_SYSTEM_FAILURE, and no change, when memory runs out; QUORVEL_INVALID_ARGUMENT without a client. Whether the
 * directory can be used is found out by the call. */
QUORVEL_API int quorvel_client_set_root(quorvel_client* client, const char* root);
/* Sets the service to call, by its name, which is copied. NULL, as at first: the daemon. Returns as above. */
QUORVEL_API int quorvel_client_set_service(quorvel_client* client, const char* service);
/* Sets the time limit in milliseconds for each later call, from its beginning to the last byte of its reply, and for
 * each later observer, until it is taken in. A negative number: no limit. */
QUORVEL_API void quorvel_client_set_time_limit(quorvel_client* client, int64_t milliseconds);
/* Sets the largest reply that later calls take, in bytes; 1 GiB at first. Memory grows with the bytes that arrive, not
 * with the length that a reply announces. */
QUORVEL_API void quorvel_client_set_maximum_reply(quorvel_client* client, uint32_t bytes);

/* The daemon's operation that answers with the regulatory images, and the notification that says that the phone number
 * may have changed. */
#define QUORVEL_COPY_REGULATORY_IMAGES "copyRegulatoryImagesWithCompletionBlock:"
#define QUORVEL_PHONE_NUMBER_CHANGED "com.Orvane.mobile.halvard.phone_number_changed"

/* Calls `operation` with `argument` (NULL: none), which stays the caller's, and waits for the reply. Returns QUORVEL_OK
 * and sets `*reply` to a value that the caller frees, or to NULL when the service answered with no value; otherwise one
 * of the codes 1 to 9, and `*reply` is NULL. `reply` must not be NULL. Any thread; several may share a client. */
QUORVEL_API int quorvel_client_call(const quorvel_client* client, const char* operation, const quorvel_value* argument,
                                    quorvel_value** reply, quorvel_error* error);

/* The regulatory images that are provisioned on the device: a dictionary, or NULL when there are none. Otherwise as
 * `quorvel_client_call`. */
QUORVEL_API int quorvel_client_copy_regulatory_images(const quorvel_client* client, quorvel_value** images,
                                                      quorvel_error* error);

/* A call under way. */
typedef struct quorvel_call quorvel_call;

/* Begins a call; otherwise as `quorvel_client_call`. Never waits. Returns the call, which the caller frees, or NULL
 * after setting `error` when it cannot begin (the device root, the service's name, the operation or its argument cannot
 * be used, or the machine refuses memory or a descriptor). Any thread; several may share a client. */
QUORVEL_API quorvel_call* quorvel_call_start(const quorvel_client* client, const char* operation,
                                             const quorvel_value* argument, quorvel_error* error);
/* Ends the call. The service may still carry it out. */
QUORVEL_API void quorvel_call_free(quorvel_call* call);

/* The descriptor to poll, for reading, and for nothing else: it becomes readable whenever the next step is due, the
 * time limit included. It stays the same until the call is freed, belongs to the call, and is never read from or closed
 * by the caller. -1 for NULL. */
QUORVEL_API int quorvel_call_descriptor(const quorvel_call* call);

/* Takes the next step, without waiting. Call it once after the start, or leave the first step to the descriptor, and
 * then each time the descriptor is readable; a step too many does no harm. Returns QUORVEL_NOT_YET until the reply is
 * there; then, once, as `quorvel_client_call` does; then QUORVEL_INVALID_ARGUMENT. `reply` must not be NULL. */
QUORVEL_API int quorvel_call_step(quorvel_call* call, quorvel_value** reply, quorvel_error* error);

/* A connection to the system notification center. */
typedef struct quorvel_observer quorvel_observer;

/* What an observer is told. */
typedef enum quorvel_event_kind {
  QUORVEL_TAKEN_IN = 1,     /* always first: every notification with a higher sequence number will be told of */
  QUORVEL_NOTIFICATION = 2, /* a notification was posted */
  QUORVEL_MISSED = 3        /* notifications were dropped because the observer read too slowly */
} quorvel_event_kind;

typedef struct quorvel_event {
  int32_t kind;                /* a quorvel_event_kind */
  uint64_t sequence;           /* of the notification; of the newest one (taken in); of the last one dropped (missed) */
  uint64_t missed;             /* how many were dropped; else 0 */
  const char* name;            /* the notification's, of printable ASCII; else "" */
  const quorvel_value* object; /* the notification's, NULL when it has none */
} quorvel_event;

/* Begins to observe, in the client's device root. Never waits. Returns the observer, which the caller frees, or NULL
 * after setting `error` when it cannot begin. Any thread; several may share a client. */
QUORVEL_API quorvel_observer* quorvel_observer_start(const quorvel_client* client, quorvel_error* error);
/* Ends the observer, and with it the event that it told last. */
QUORVEL_API void quorvel_observer_free(quorvel_observer* observer);

/* The descriptor to poll: as `quorvel_call_descriptor`. It is readable as long as an event is at hand. */
QUORVEL_API int quorvel_observer_descriptor(const quorvel_observer* observer);

/* Takes the next step, without waiting. Returns QUORVEL_OK and sets `*event`, whose name and object are lent until the
 * next step or wait; QUORVEL_NOT_YET when there is none; otherwise one of the codes 1 to 9, and the observer has ended:
 * free it, and start another to go on. `event` must not be NULL. */
QUORVEL_API int quorvel_observer_step(quorvel_observer* observer, quorvel_event* event, quorvel_error* error);

/* The same, waiting for the event up to `milliseconds`; a negative number waits without end. Returns QUORVEL_NOT_YET
 * when there was none in time; the observer goes on. */
QUORVEL_API int quorvel_observer_wait(quorvel_observer* observer, int64_t milliseconds, quorvel_event* event,
                                      quorvel_error* error);

#ifdef __cplusplus
}
#endif

#endif
