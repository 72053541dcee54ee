/* Prints the regulatory images, then waits for the phone number to change. Needs nothing but libquorvel:
 *
 *   cc regulatory_images.c $(pkg-config --cflags --libs quorvel) && ./a.out
 */
#include <quorvel.h>
#include <stdio.h>
#include <string.h>

static int report(const char* doing, const quorvel_error* error) {
  fprintf(stderr, "%s: %s\n", doing, error->sentence);
  return 1;
}

int main(void) {
  quorvel_error error;
  quorvel_value* images = NULL;
  const quorvel_value *key, *value;
  size_t position = 0;
  char text[200];

  quorvel_client* client = quorvel_client_new();
  if (quorvel_client_copy_regulatory_images(client, &images, &error) != QUORVEL_OK) return report("images", &error);
  while (quorvel_dictionary_next(images, &position, &key, &value)) {
    quorvel_string_copy(key, text, sizeof text);
    printf("%s = ", text);
    quorvel_value_describe(value, text, sizeof text);
    printf("%s\n", text);
  }
  quorvel_value_free(images);

  quorvel_event event;
  quorvel_observer* observer = quorvel_observer_start(client, &error);
  if (observer == NULL) return report("observer", &error);
  do {
    if (quorvel_observer_wait(observer, -1, &event, &error) != QUORVEL_OK) return report("observer", &error);
    printf("#%llu %s\n", (unsigned long long)event.sequence, event.kind == QUORVEL_TAKEN_IN ? "listening" : event.name);
    fflush(stdout);
  } while (strcmp(event.name, QUORVEL_PHONE_NUMBER_CHANGED) != 0);
  quorvel_observer_free(observer);
  quorvel_client_free(client);
  return 0;
}
