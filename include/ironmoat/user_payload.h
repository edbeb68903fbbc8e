#pragma once

#include <cstddef>
#include <string_view>

#include "ironmoat/http_headers.h"
#include "ironmoat/output_record.h"
#include "ironmoat/payload_parts.h"
#include "ironmoat/sparse_field.h"

namespace ironmoat {

struct DrelUserPayload;

/// What DrelUserPayload is made with, in label order; `command` is labelled `with`. A field of type
/// IRONMOAT_SPARSE(T) is read as an Optional<T> is (sparse_field.h). The first field of each group:
///
///     command               command header
///     payload               bodies
///     messageId             identity and delivery control
///     KibbOwnerId           references to the attachment store
///     contentVersion        content description
///     token                 token and sender
///     responseStatus        response status, times, failure report
///     encryptionType        handling
///     internalBuild         flags
///     contentType           content type; HTTP header values, independent of httpHeaders
///     dommelDeliveryStatus  delivery reports, retries, fan-out chunks
///     webtunnelVersion      web tunnel, as in VeskCommandWebTunnelResponse
///     writeToNimbra         flags and identifiers
///     protocolVersion       relay allocation
///     originalCommand       flags and codes
struct DrelUserPayloadArguments : detail::SparseValues {
  using Sparse = DrelUserPayloadArguments;
  static constexpr std::size_t kFirstLine = __LINE__ + 1;
  Int command = 0;
  IRONMOAT_SPARSE(Int) commandContext;
  IRONMOAT_SPARSE(Int) version;
  IRONMOAT_SPARSE(Data) payload;
  IRONMOAT_SPARSE(Data) bulkedPayload;
  IRONMOAT_SPARSE(Data) fanoutPayload;
  IRONMOAT_SPARSE(Data) additionalPayload;
  IRONMOAT_SPARSE(Data) payloadMetadata;
  IRONMOAT_SPARSE(String) messageId;
  IRONMOAT_SPARSE(Data) messageUUID;
  IRONMOAT_SPARSE(String) queueId;
  IRONMOAT_SPARSE(Bool) deliveryStatus;
  Optional<DrelUserPayloadDeliveryContext> deliveryContext;
  IRONMOAT_SPARSE(Int) certifiedDeliveryVersion;
  IRONMOAT_SPARSE(Data) certifiedDeliveryRts;
  IRONMOAT_SPARSE(Bool) noResponseNeeded;
  IRONMOAT_SPARSE(Bool) generateDeliveryReceipt;
  IRONMOAT_SPARSE(Data) sessionToken;
  IRONMOAT_SPARSE(Data) dommelSessionToken;
  IRONMOAT_SPARSE(String) destinationId;
  IRONMOAT_SPARSE(String) userAgent;
  IRONMOAT_SPARSE(String) KibbOwnerId;
  IRONMOAT_SPARSE(Data) KibbFileSignature;
  IRONMOAT_SPARSE(Int64) KibbFileLength;
  IRONMOAT_SPARSE(String) KibbAuthToken;
  IRONMOAT_SPARSE(String) KibbAuthUrl;
  IRONMOAT_SPARSE(String) KibbAuthId;
  Optional<List<String>> KibbDownloadAuthList;
  Optional<List<String>> KibbDownloadUrlList;
  IRONMOAT_SPARSE(String) KibbDownloadUrl;
  IRONMOAT_SPARSE(String) KibbUploadUrl;
  IRONMOAT_SPARSE(Int64) KibbExpiryNanos;
  IRONMOAT_SPARSE(Int) contentVersion;
  IRONMOAT_SPARSE(String) contentHeaders;
  IRONMOAT_SPARSE(Data) contentBody;
  IRONMOAT_SPARSE(Data) contentReferenceSignature;
  IRONMOAT_SPARSE(Int) attachmentSize;
  IRONMOAT_SPARSE(Data) token;
  IRONMOAT_SPARSE(String) senderId;
  IRONMOAT_SPARSE(String) senderOpaqueId;
  IRONMOAT_SPARSE(String) mspId;
  IRONMOAT_SPARSE(Int) responseStatus;
  IRONMOAT_SPARSE(Int64) epochTimeNanos;          ///< nanoseconds since the epoch
  IRONMOAT_SPARSE(Int64) originalEpochTimeNanos;  ///< nanoseconds since the epoch
  IRONMOAT_SPARSE(Int) failReason;
  IRONMOAT_SPARSE(Data) failMessageId;
  IRONMOAT_SPARSE(String) failMessageIdString;
  IRONMOAT_SPARSE(Int) failDownloadAttachmentSize;
  IRONMOAT_SPARSE(Int) failUploadAttachmentSize;
  IRONMOAT_SPARSE(String) failReasonMessage;
  IRONMOAT_SPARSE(Int64) failTimeElapsed;
  IRONMOAT_SPARSE(String) encryptionType;
  IRONMOAT_SPARSE(Int) storageFlags;
  IRONMOAT_SPARSE(Int) priority;
  IRONMOAT_SPARSE(Int) senderExpectsAck;
  List<DrelUserPayload> dstIdTokenList;     ///< nested payloads
  List<DrelUserPayload> corvelMessageList;  ///< nested payloads
  IRONMOAT_SPARSE(Int) storageCheckVersion;
  IRONMOAT_SPARSE(Int64) dateExpirationSeconds;
  IRONMOAT_SPARSE(Int) corvelProtocol;
  IRONMOAT_SPARSE(Bool) internalBuild;
  IRONMOAT_SPARSE(Bool) loggingProfile;
  IRONMOAT_SPARSE(Bool) traceProfile;
  IRONMOAT_SPARSE(Bool) groupMessage;
  IRONMOAT_SPARSE(String) contentType;
  IRONMOAT_SPARSE(String) adhocServiceOverride;
  IRONMOAT_SPARSE(Data) responseIdentifier;
  IRONMOAT_SPARSE(String) responseIdentifierString;
  IRONMOAT_SPARSE(String) strictTransportSecurity;
  IRONMOAT_SPARSE(String) traceId;
  IRONMOAT_SPARSE(String) splunkHint;
  IRONMOAT_SPARSE(String) asHttpHeader;
  IRONMOAT_SPARSE(Int) dommelDeliveryStatus;  ///< home automation
  IRONMOAT_SPARSE(String) dommelReportId;     ///< home automation
  IRONMOAT_SPARSE(Int) retryCount;
  IRONMOAT_SPARSE(String) testOptions;
  IRONMOAT_SPARSE(Int) fanoutChunkNumber;
  IRONMOAT_SPARSE(Bool) fanoutLastChunk;
  IRONMOAT_SPARSE(String) url;
  IRONMOAT_SPARSE(Int) parloRetryCount;
  IRONMOAT_SPARSE(Int) webtunnelVersion;
  IRONMOAT_SPARSE(String) httpUrl;
  Optional<DrelUserPayloadHttpHeaders> httpHeaders;
  IRONMOAT_SPARSE(Data) httpBody;
  IRONMOAT_SPARSE(String) httpBodyUrl;      ///< where the body is, if it is not in httpBody
  IRONMOAT_SPARSE(Data) httpBodyKey;        ///< key of the body at httpBodyUrl
  IRONMOAT_SPARSE(Int) httpResponseStatus;  ///< HTTP status code
  IRONMOAT_SPARSE(String) httpErrorMsg;
  IRONMOAT_SPARSE(Bool) writeToNimbra;  ///< write to the cloud
  IRONMOAT_SPARSE(Bool) pessimisticCheck;
  IRONMOAT_SPARSE(Bool) unfilteredHeaders;
  IRONMOAT_SPARSE(Int) deliveryStatusFlags;
  IRONMOAT_SPARSE(String) conferenceURI;
  IRONMOAT_SPARSE(Data) selfSessionToken;
  IRONMOAT_SPARSE(Data) queryHash;
  IRONMOAT_SPARSE(Int) testDropPoint;
  IRONMOAT_SPARSE(Bool) userPlusOne;
  IRONMOAT_SPARSE(Bool) isInitiatorKey;
  IRONMOAT_SPARSE(Int) errorCode;
  IRONMOAT_SPARSE(Bool) messageCheckpoint;
  IRONMOAT_SPARSE(Int) conversationId;
  IRONMOAT_SPARSE(Int) protocolVersion;
  IRONMOAT_SPARSE(String) applicationId;
  IRONMOAT_SPARSE(Int) reason;
  IRONMOAT_SPARSE(Int) prevErrorCode;
  IRONMOAT_SPARSE(Data) prevAccessToken;
  IRONMOAT_SPARSE(Data) prevRelayIp;  ///< address as bytes
  IRONMOAT_SPARSE(Int) prevTimestamp;
  IRONMOAT_SPARSE(Data) activeAccessToken;
  IRONMOAT_SPARSE(Data) activeRelayIp;  ///< address as bytes
  IRONMOAT_SPARSE(Int) selfAllocTokenCountOld;
  IRONMOAT_SPARSE(Int) selfAllocTokenCount;
  List<DrelHoplinePluginRequest> pluginRequests;
  IRONMOAT_SPARSE(String) pluginName;
  IRONMOAT_SPARSE(String) pluginConfig;
  IRONMOAT_SPARSE(Int) pluginStream;
  IRONMOAT_SPARSE(Bool) pluginDevMode;
  IRONMOAT_SPARSE(Bool) hoplineNewSession;
  IRONMOAT_SPARSE(Int) requestType;
  IRONMOAT_SPARSE(Data) veskSessionId;
  IRONMOAT_SPARSE(Int) relayProvider;
  IRONMOAT_SPARSE(Bool) sharedSession;
  IRONMOAT_SPARSE(String) groupId;
  IRONMOAT_SPARSE(Int) groupMemberCount;
  IRONMOAT_SPARSE(Int) allocateInfoAttribute;
  IRONMOAT_SPARSE(Data) relayIp;    ///< address as bytes
  IRONMOAT_SPARSE(Data) relayIpv6;  ///< address as bytes
  IRONMOAT_SPARSE(Int) relayPort;
  IRONMOAT_SPARSE(Data) relayAccessToken;
  IRONMOAT_SPARSE(Data) relaySessionKey;
  IRONMOAT_SPARSE(Data) relaySessionId;
  IRONMOAT_SPARSE(Int64) expiryEpochTimeMillis;  ///< milliseconds since the epoch
  IRONMOAT_SPARSE(Data) initiatorIp;             ///< address as bytes
  IRONMOAT_SPARSE(Int64) participantId;
  IRONMOAT_SPARSE(Data) softwareVersion;
  IRONMOAT_SPARSE(String) relayBuildVersion;
  IRONMOAT_SPARSE(Int64) allocationEpochTimeMillis;  ///< milliseconds since the epoch
  IRONMOAT_SPARSE(Int) allocationStatus;
  List<DrelHoplineAllocationStatus> allocationStatuses;
  List<DrelHoplineSelfAllocToken> selfAllocTokenList;
  IRONMOAT_SPARSE(Data) relayReportingBlob;
  IRONMOAT_SPARSE(Int) relayServerType;
  List<DrelHoplinePluginAllocation> pluginAllocations;
  IRONMOAT_SPARSE(Int) hoplineErrorCode;
  IRONMOAT_SPARSE(Int) originalCommand;
  IRONMOAT_SPARSE(Bool) isBulkedPayload;
  IRONMOAT_SPARSE(Bool) wantsAppAck;
  IRONMOAT_SPARSE(String) errorDomain;
  IRONMOAT_SPARSE(Bool) expectsPeerResponse;
  IRONMOAT_SPARSE(Int) allowGDR;

  using R = DrelUserPayloadArguments;
  using Fields = FieldList<
      R, &R::command, &R::commandContext, &R::version, &R::payload, &R::bulkedPayload,
      &R::fanoutPayload, &R::additionalPayload, &R::payloadMetadata, &R::messageId, &R::messageUUID,
      &R::queueId, &R::deliveryStatus, &R::deliveryContext, &R::certifiedDeliveryVersion,
      &R::certifiedDeliveryRts, &R::noResponseNeeded, &R::generateDeliveryReceipt, &R::sessionToken,
      &R::dommelSessionToken, &R::destinationId, &R::userAgent, &R::KibbOwnerId,
      &R::KibbFileSignature, &R::KibbFileLength, &R::KibbAuthToken, &R::KibbAuthUrl, &R::KibbAuthId,
      &R::KibbDownloadAuthList, &R::KibbDownloadUrlList, &R::KibbDownloadUrl, &R::KibbUploadUrl,
      &R::KibbExpiryNanos, &R::contentVersion, &R::contentHeaders, &R::contentBody,
      &R::contentReferenceSignature, &R::attachmentSize, &R::token, &R::senderId,
      &R::senderOpaqueId, &R::mspId, &R::responseStatus, &R::epochTimeNanos,
      &R::originalEpochTimeNanos, &R::failReason, &R::failMessageId, &R::failMessageIdString,
      &R::failDownloadAttachmentSize, &R::failUploadAttachmentSize, &R::failReasonMessage,
      &R::failTimeElapsed, &R::encryptionType, &R::storageFlags, &R::priority, &R::senderExpectsAck,
      &R::dstIdTokenList, &R::corvelMessageList, &R::storageCheckVersion, &R::dateExpirationSeconds,
      &R::corvelProtocol, &R::internalBuild, &R::loggingProfile, &R::traceProfile, &R::groupMessage,
      &R::contentType, &R::adhocServiceOverride, &R::responseIdentifier,
      &R::responseIdentifierString, &R::strictTransportSecurity, &R::traceId, &R::splunkHint,
      &R::asHttpHeader, &R::dommelDeliveryStatus, &R::dommelReportId, &R::retryCount,
      &R::testOptions, &R::fanoutChunkNumber, &R::fanoutLastChunk, &R::url, &R::parloRetryCount,
      &R::webtunnelVersion, &R::httpUrl, &R::httpHeaders, &R::httpBody, &R::httpBodyUrl,
      &R::httpBodyKey, &R::httpResponseStatus, &R::httpErrorMsg, &R::writeToNimbra,
      &R::pessimisticCheck, &R::unfilteredHeaders, &R::deliveryStatusFlags, &R::conferenceURI,
      &R::selfSessionToken, &R::queryHash, &R::testDropPoint, &R::userPlusOne, &R::isInitiatorKey,
      &R::errorCode, &R::messageCheckpoint, &R::conversationId, &R::protocolVersion,
      &R::applicationId, &R::reason, &R::prevErrorCode, &R::prevAccessToken, &R::prevRelayIp,
      &R::prevTimestamp, &R::activeAccessToken, &R::activeRelayIp, &R::selfAllocTokenCountOld,
      &R::selfAllocTokenCount, &R::pluginRequests, &R::pluginName, &R::pluginConfig,
      &R::pluginStream, &R::pluginDevMode, &R::hoplineNewSession, &R::requestType,
      &R::veskSessionId, &R::relayProvider, &R::sharedSession, &R::groupId, &R::groupMemberCount,
      &R::allocateInfoAttribute, &R::relayIp, &R::relayIpv6, &R::relayPort, &R::relayAccessToken,
      &R::relaySessionKey, &R::relaySessionId, &R::expiryEpochTimeMillis, &R::initiatorIp,
      &R::participantId, &R::softwareVersion, &R::relayBuildVersion, &R::allocationEpochTimeMillis,
      &R::allocationStatus, &R::allocationStatuses, &R::selfAllocTokenList, &R::relayReportingBlob,
      &R::relayServerType, &R::pluginAllocations, &R::hoplineErrorCode, &R::originalCommand,
      &R::isBulkedPayload, &R::wantsAppAck, &R::errorDomain, &R::expectsPeerResponse, &R::allowGDR>;
};
IRONMOAT_API void admit(const DrelUserPayloadArguments& arguments);

/// A message payload, with the payloads and relay records nested in it. Its six lists of records
/// are always there and may be empty; every other field but `command` may be absent.
struct IRONMOAT_API DrelUserPayload : OutputRecord<DrelUserPayload, DrelUserPayloadArguments> {
  using OutputRecord::OutputRecord;
  static constexpr std::string_view schemaName = "DrelUserPayload";
};

}  // namespace ironmoat
