/* A plugin of qemu's emulation of single programs: counts the instructions that
 * the emulated program executes, and tells at its end. Debian brings qemu without
 * the header of its plugins, so that what is used of it is declared here. */

#include <stddef.h>
#include <stdint.h>
#include <stdio.h>

typedef uint64_t plugin_id;
struct translated_block;
struct instruction;

/* The oldest interface that has all of this. */
__attribute__((visibility("default"))) int qemu_plugin_version = 1;

size_t qemu_plugin_tb_n_insns(const struct translated_block* block);
struct instruction* qemu_plugin_tb_get_insn(const struct translated_block* block, size_t index);
/* The only operation there is, number 0, adds. */
void qemu_plugin_register_vcpu_insn_exec_inline(struct instruction* instruction, int operation,
                                                void* number, uint64_t addend);
void qemu_plugin_register_vcpu_tb_trans_cb(plugin_id id,
                                           void (*translated)(plugin_id, struct translated_block*));
void qemu_plugin_register_atexit_cb(plugin_id id, void (*at_exit)(plugin_id, void*), void* data);

static uint64_t executed;

static void count_block(plugin_id id, struct translated_block* block) {
  (void)id;
  for (size_t i = 0; i < qemu_plugin_tb_n_insns(block); ++i) {
    qemu_plugin_register_vcpu_insn_exec_inline(qemu_plugin_tb_get_insn(block, i), 0, &executed, 1);
  }
}

static void tell(plugin_id id, void* data) {
  (void)id, (void)data;
  fprintf(stderr, "Collected : %llu\n", (unsigned long long)executed);
}

__attribute__((visibility("default"))) int qemu_plugin_install(plugin_id id, const void* emulator,
                                                               int argc, char** argv) {
  (void)emulator, (void)argc, (void)argv;
  qemu_plugin_register_vcpu_tb_trans_cb(id, count_block);
  qemu_plugin_register_atexit_cb(id, tell, NULL);
  return 0;
}
