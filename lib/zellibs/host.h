// A host: where the answers of the operations come from. This Linux machine and a recorded host
// stand behind the same table of methods.
#pragma once

#include <cstdint>

#include "nodes.h"
#include "zellibs.h"

// The methods give a status; what they hand out counts only when it is KIF_STATUS_OK. `node`
// offers what is asked of it, and `instance` (null: none) holds any parameters at all: a host
// checks their number and types itself.
struct Host {
  // Fills `record`, node.recordSize bytes that are zero before the call.
  KIF_Status (*getRecord)(const NodeInfo &node, const KIF_ParamList *instance, void *record);

  // Appends the instances below `parent` to `list`, which is empty before the call.
  KIF_Status (*getInstances)(const NodeInfo &node, const KIF_ParamList *parent,
                             KIF_ParamList *list);

  // Total length of a content, in bytes.
  KIF_Status (*getContentLength)(const NodeInfo &node, const KIF_ParamList *instance,
                                 uint32_t *length);

  // Reads up to `wanted` bytes of a content from `offset` into `bytes`; `*given` is how many.
  KIF_Status (*getContent)(const NodeInfo &node, const KIF_ParamList *instance, uint32_t offset,
                           uint32_t wanted, void *bytes, uint32_t *given);

  KIF_Status (*set)(const NodeInfo &node, const KIF_ParamList *instance,
                    const KIF_ParamList *input);

  // Writes the build date of the host's kernel to `date` (21 bytes, terminated) and tells whether
  // the host's interface signature is the library's.
  KIF_Status (*checkSignature)(char *date, bool *matches);
};

// The host that answers now: chosen by ZELLIBS_HOST at the first call, replaced by UseRecordedHost.
// KIF_STATUS_NO_HOST when there is none, or the status with which its cache file was refused.
KIF_Status CurrentHost(const Host **host);

// Whether there is a host to be live on, be it one that cannot be read.
bool HasLiveHost();

// Whether the host is not the machine that this process runs on.
bool IsForeignHost();

// Whether the live host is one that cannot be read, a file that is none; says so on standard error
// in a line: file and reason. Such a name is mostly mistyped.
bool TellOfUnusableHost();

// Makes the cache file `path` the host; on failure the host stays what it was.
KIF_Status UseRecordedHost(const char *path);

extern const Host kLinuxHost;

// Opens the cache file at `path` as the recorded host; `*host` is then its methods.
KIF_Status OpenRecordedHost(const char *path, const Host **host);

// Puts `root`, a text that stays, in front of /proc, /sys, /dev, /boot and /etc.
void SetLinuxRoot(const char *root);
