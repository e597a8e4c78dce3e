// The search tree branches by two bits of a mixed thread id per level. Mixing
// is one-to-one, so different ids part after 32 levels at the latest, whatever
// ids a file was made with. The root is the oldest entry of the list: entries
// come one by one and go all together, so it stays. An entry is one block of
// malloc with thread_info in front.
#include "thread_state.h"

#include "handover.h"

#include <cstdlib>
#include <new>

namespace {

struct thread_node : thread_info {
    thread_node* pRoot;
    thread_node* pBranches[4];
};

// One-to-one on 64 bits; every bit of the id reaches every bit of the result.
uint64_t mix(uint64_t id) {
    id = (id ^ (id >> 30)) * 0xBF58476D1CE4E5B9U;
    id = (id ^ (id >> 27)) * 0x94D049BB133111EBU;
    return id ^ (id >> 31);
}

} // namespace

thread_info* get_thread_info(trace_file* pTraceFile, uint64_t threadId) {
    auto* pNewest = static_cast<thread_node*>(pTraceFile->pThreadInfo);
    thread_node* pRoot = pNewest != nullptr ? pNewest->pRoot : nullptr;
    thread_node** ppNode = &pRoot;
    for (uint64_t path = mix(threadId); *ppNode != nullptr; path >>= 2) {
        if ((*ppNode)->id == threadId)
            return *ppNode;
        ppNode = &(*ppNode)->pBranches[path & 3];
    }

    void* pBlock = std::malloc(sizeof(thread_node));
    if (pBlock == nullptr)
        return nullptr;
    auto* pNode = new (pBlock) thread_node{{pNewest, threadId, 0, 0}, nullptr, {}};
    *ppNode = pNode;
    pNode->pRoot = pRoot;
    pTraceFile->pThreadInfo = pNode;
    return pNode;
}

void free_thread_info(trace_file* pTraceFile) {
    const bool bMainThread = owns_standard_output();
    while (thread_info* pThread = pTraceFile->pThreadInfo) {
        pTraceFile->pThreadInfo = pThread->pNext;
        if (bMainThread && anchor.pCurThread == pThread)
            anchor.pCurThread = nullptr;
        std::free(static_cast<thread_node*>(pThread));
    }
}
