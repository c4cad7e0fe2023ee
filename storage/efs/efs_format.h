// The EFS2 requests and their replies. Every reply repeats the 4 header bytes of its request; offsets count from them.
#ifndef KRAL_STORAGE_EFS_EFS_FORMAT_H
#define KRAL_STORAGE_EFS_EFS_FORMAT_H

#include "commands/request.h"

namespace kral::efs {

inline constexpr u8 kSubsystem = 19;
inline constexpr size_t kHeaderSize = 4;  // 75, subsystem, 16-bit command

// Paths stand in requests with their terminating zero.
using Path = Bytes;

template <class... Fields>
using EfsRequest = SubsystemRequest<Fields...>;

inline constexpr EfsRequest<u32, u32, Path> kOpen{kSubsystem, 2};      // flags, mode
inline constexpr EfsRequest<u32> kClose{kSubsystem, 3};                // descriptor
inline constexpr EfsRequest<u32, u32, u32> kRead{kSubsystem, 4};       // descriptor, bytes wanted, offset
inline constexpr EfsRequest<u32, u32, Bytes> kWrite{kSubsystem, 5};    // descriptor, offset, data
inline constexpr EfsRequest<Path, Path> kSymbolicLink{kSubsystem, 6};  // target, then the link
inline constexpr EfsRequest<Path> kReadLink{kSubsystem, 7};
inline constexpr EfsRequest<Path> kUnlink{kSubsystem, 8};
inline constexpr EfsRequest<u16, Path> kMakeDirectory{kSubsystem, 9};  // mode
inline constexpr EfsRequest<Path> kRemoveDirectory{kSubsystem, 10};
inline constexpr EfsRequest<Path> kOpenDirectory{kSubsystem, 11};
inline constexpr EfsRequest<u32, u32> kReadDirectory{kSubsystem, 12};  // directory handle, sequence from 1
inline constexpr EfsRequest<u32> kCloseDirectory{kSubsystem, 13};      // directory handle
inline constexpr EfsRequest<Path, Path> kRename{kSubsystem, 14};       // old, new
inline constexpr EfsRequest<Path> kStat{kSubsystem, 15};
inline constexpr EfsRequest<u16, Path> kChangeMode{kSubsystem, 18};
inline constexpr EfsRequest<Path> kFileSystemStatus{kSubsystem, 19};
inline constexpr EfsRequest<u16, Path> kAccess{kSubsystem, 20};  // permission bits
inline constexpr EfsRequest<> kDeviceInfo{kSubsystem, 21};
inline constexpr EfsRequest<u32> kExtendedInfo{kSubsystem, 29};                    // query
inline constexpr EfsRequest<u32, u32, u16, Bytes, Path> kPutItem{kSubsystem, 38};  // size, flags, sequence, data
inline constexpr EfsRequest<u32, u32, u16, Path> kGetItem{kSubsystem, 39};         // size wanted, path size, sequence
inline constexpr EfsRequest<Path> kSyncWithoutWait{kSubsystem, 48};
inline constexpr EfsRequest<Path> kSyncStatus{kSubsystem, 49};
inline constexpr EfsRequest<Path> kMakeGoldenCopy{kSubsystem, 53};
static_assert(AreSorted(kOpen, kClose, kRead, kWrite, kSymbolicLink, kReadLink, kUnlink, kMakeDirectory,
                        kRemoveDirectory, kOpenDirectory, kReadDirectory, kCloseDirectory, kRename, kStat, kChangeMode,
                        kFileSystemStatus, kAccess, kDeviceInfo, kExtendedInfo, kPutItem, kGetItem, kSyncWithoutWait,
                        kSyncStatus, kMakeGoldenCopy));

// --- Limits ---------------------------------------------------------------------------------------------------------

inline constexpr size_t kLongestRequest = 256;      // with a path
inline constexpr size_t kLongestGetRequest = 1039;  // of an item file
inline constexpr size_t kGetRequestOverhead = 15;   // beside the path's characters
inline constexpr size_t kLongestItemPath = kLongestGetRequest - kGetRequestOverhead;
inline constexpr size_t kLongestReply = 4091;  // the de-framer drops longer ones
inline constexpr size_t kReadOverhead = 20;    // of a read reply, beside the data
inline constexpr size_t kWriteOverhead = 12;   // of a write request
inline constexpr u32 kMostGrowth = 1 << 20;    // of a file while it is read, beyond the size that its status told
inline constexpr int kTries = 5;

// --- Request values -------------------------------------------------------------------------------------------------

inline constexpr u32 kOpenToRead = 0;
inline constexpr u32 kOpenToWrite = 0x241;  // write only, create, truncate
inline constexpr u32 kModeOfReading = 0444;
inline constexpr u32 kModeOfNewFiles = 0666;
inline constexpr u16 kModeOfNewDirectories = 0777;
inline constexpr u32 kItemFlags = 0x00080040;
inline constexpr u16 kItemSequence = 1;
inline constexpr u32 kFirstEntry = 1;

// --- Error numbers that the library acts on -------------------------------------------------------------------------

inline constexpr u32 kDone = 0;
inline constexpr u32 kMissing = 2;
inline constexpr u32 kNoRoom = 28;
inline constexpr u32 kExists = 6;
inline constexpr u32 kBadDescriptor = 9;

// --- Replies --------------------------------------------------------------------------------------------------------

inline constexpr size_t kErrorBehindHeader = 4;  // of close, mkdir, read link, device and extended info, sync
inline constexpr size_t kHandleAt = 4;           // descriptor or directory handle: open, read, write, opendir, readdir
inline constexpr size_t kErrorBehindHandle = 8;  // open, opendir

inline constexpr size_t kTransferOffset = 8;  // read and write: where in the file
inline constexpr size_t kTransferCount = 12;
inline constexpr size_t kTransferError = 16;
inline constexpr size_t kReadData = 20;

inline constexpr size_t kLinkText = 8;

inline constexpr size_t kItemCount = 4;
inline constexpr size_t kItemError = 8;
inline constexpr size_t kItemData = 14;

namespace entry {  // of a directory
inline constexpr size_t kSequence = 8;
inline constexpr size_t kError = 12;
inline constexpr size_t kType = 16;
inline constexpr size_t kMode = 20;
inline constexpr size_t kSize = 24;
inline constexpr size_t kAccessTime = 28;
inline constexpr size_t kModifyTime = 32;
inline constexpr size_t kChangeTime = 36;
inline constexpr size_t kName = 40;
inline constexpr u32 kFile = 0;
inline constexpr u32 kDirectory = 1;
inline constexpr u32 kLink = 2;
}  // namespace entry

namespace device_info {
inline constexpr size_t kFields = 8;  // seven double words
inline constexpr size_t kName = 36;
}  // namespace device_info

namespace extended_info {
inline constexpr size_t kDataType = 8;
inline constexpr size_t kData = 12;
inline constexpr u32 kNumber = 0;
inline constexpr u32 kText = 1;
}  // namespace extended_info

inline constexpr size_t kSyncState = 8;  // of both sync requests
inline constexpr u32 kInSync = 0;

inline constexpr u32 kModeKind = 0xF000;
inline constexpr u32 kFolder = 0x4000;
inline constexpr u32 kPlainFile = 0x8000;
inline constexpr u32 kItemFile = 0xE000;

}  // namespace kral::efs

#endif
