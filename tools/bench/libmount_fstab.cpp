// What a user would read an fstab with instead: libmount_fstab FILE N reads it N times and prints
// the number of entries.
#include <libmount/libmount.h>
#include <stdio.h>
#include <stdlib.h>

int main(int, char** argv) {
  int entries = 0;
  for (int i = atoi(argv[2]); i > 0; --i) {
    struct libmnt_table* table = mnt_new_table_from_file(argv[1]);
    if (table == nullptr) return 1;
    entries = mnt_table_get_nents(table);
    mnt_unref_table(table);
  }
  printf("%d\n", entries);
  return 0;
}
