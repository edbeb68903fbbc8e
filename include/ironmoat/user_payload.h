#pragma once

#include <string_view>

#include "ironmoat/http_headers.h"
#include "ironmoat/output_record.h"
#include "ironmoat/payload_parts.h"

namespace ironmoat {

struct DrelUserPayload;

/// What DrelUserPayload is made with, in label order; `command` is labelled `with`.
struct DrelUserPayloadArguments {
  Int command = 0;
  Optional<Int> commandContext;
  Optional<Int> version;
  Optional<Data> payload;
  Optional<Data> bulkedPayload;
  Optional<Data> fanoutPayload;
  Optional<Data> additionalPayload;
  Optional<Data> payloadMetadata;
  Optional<String> messageId;
  Optional<Data> messageUUID;
  Optional<String> queueId;
  Optional<Bool> deliveryStatus;
  Optional<DrelUserPayloadDeliveryContext> deliveryContext;
  Optional<Int> certifiedDeliveryVersion;
  Optional<Data> certifiedDeliveryRts;
  Optional<Bool> noResponseNeeded;
  Optional<Bool> generateDeliveryReceipt;
  Optional<Data> sessionToken;
  Optional<Data> dommelSessionToken;
  Optional<String> destinationId;
  Optional<String> userAgent;
  Optional<String> KibbOwnerId;
  Optional<Data> KibbFileSignature;
  Optional<Int64> KibbFileLength;
  Optional<String> KibbAuthToken;
  Optional<String> KibbAuthUrl;
  Optional<String> KibbAuthId;
  Optional<List<String>> KibbDownloadAuthList;
  Optional<List<String>> KibbDownloadUrlList;
  Optional<String> KibbDownloadUrl;
  Optional<String> KibbUploadUrl;
  Optional<Int64> KibbExpiryNanos;
  Optional<Int> contentVersion;
  Optional<String> contentHeaders;
  Optional<Data> contentBody;
  Optional<Data> contentReferenceSignature;
  Optional<Int> attachmentSize;
  Optional<Data> token;
  Optional<String> senderId;
  Optional<String> senderOpaqueId;
  Optional<String> mspId;
  Optional<Int> responseStatus;
  Optional<Int64> epochTimeNanos;
  Optional<Int64> originalEpochTimeNanos;
  Optional<Int> failReason;
  Optional<Data> failMessageId;
  Optional<String> failMessageIdString;
  Optional<Int> failDownloadAttachmentSize;
  Optional<Int> failUploadAttachmentSize;
  Optional<String> failReasonMessage;
  Optional<Int64> failTimeElapsed;
  Optional<String> encryptionType;
  Optional<Int> storageFlags;
  Optional<Int> priority;
  Optional<Int> senderExpectsAck;
  List<DrelUserPayload> dstIdTokenList;
  List<DrelUserPayload> corvelMessageList;
  Optional<Int> storageCheckVersion;
  Optional<Int64> dateExpirationSeconds;
  Optional<Int> corvelProtocol;
  Optional<Bool> internalBuild;
  Optional<Bool> loggingProfile;
  Optional<Bool> traceProfile;
  Optional<Bool> groupMessage;
  Optional<String> contentType;
  Optional<String> adhocServiceOverride;
  Optional<Data> responseIdentifier;
  Optional<String> responseIdentifierString;
  Optional<String> strictTransportSecurity;
  Optional<String> traceId;
  Optional<String> splunkHint;
  Optional<String> asHttpHeader;
  Optional<Int> dommelDeliveryStatus;
  Optional<String> dommelReportId;
  Optional<Int> retryCount;
  Optional<String> testOptions;
  Optional<Int> fanoutChunkNumber;
  Optional<Bool> fanoutLastChunk;
  Optional<String> url;
  Optional<Int> parloRetryCount;
  Optional<Int> webtunnelVersion;
  Optional<String> httpUrl;
  Optional<DrelUserPayloadHttpHeaders> httpHeaders;
  Optional<Data> httpBody;
  Optional<String> httpBodyUrl;
  Optional<Data> httpBodyKey;
  Optional<Int> httpResponseStatus;
  Optional<String> httpErrorMsg;
  Optional<Bool> writeToNimbra;
  Optional<Bool> pessimisticCheck;
  Optional<Bool> unfilteredHeaders;
  Optional<Int> deliveryStatusFlags;
  Optional<String> conferenceURI;
  Optional<Data> selfSessionToken;
  Optional<Data> queryHash;
  Optional<Int> testDropPoint;
  Optional<Bool> userPlusOne;
  Optional<Bool> isInitiatorKey;
  Optional<Int> errorCode;
  Optional<Bool> messageCheckpoint;
  Optional<Int> conversationId;
  Optional<Int> protocolVersion;
  Optional<String> applicationId;
  Optional<Int> reason;
  Optional<Int> prevErrorCode;
  Optional<Data> prevAccessToken;
  Optional<Data> prevRelayIp;
  Optional<Int> prevTimestamp;
  Optional<Data> activeAccessToken;
  Optional<Data> activeRelayIp;
  Optional<Int> selfAllocTokenCountOld;
  Optional<Int> selfAllocTokenCount;
  List<DrelHoplinePluginRequest> pluginRequests;
  Optional<String> pluginName;
  Optional<String> pluginConfig;
  Optional<Int> pluginStream;
  Optional<Bool> pluginDevMode;
  Optional<Bool> hoplineNewSession;
  Optional<Int> requestType;
  Optional<Data> veskSessionId;
  Optional<Int> relayProvider;
  Optional<Bool> sharedSession;
  Optional<String> groupId;
  Optional<Int> groupMemberCount;
  Optional<Int> allocateInfoAttribute;
  Optional<Data> relayIp;
  Optional<Data> relayIpv6;
  Optional<Int> relayPort;
  Optional<Data> relayAccessToken;
  Optional<Data> relaySessionKey;
  Optional<Data> relaySessionId;
  Optional<Int64> expiryEpochTimeMillis;
  Optional<Data> initiatorIp;
  Optional<Int64> participantId;
  Optional<Data> softwareVersion;
  Optional<String> relayBuildVersion;
  Optional<Int64> allocationEpochTimeMillis;
  Optional<Int> allocationStatus;
  List<DrelHoplineAllocationStatus> allocationStatuses;
  List<DrelHoplineSelfAllocToken> selfAllocTokenList;
  Optional<Data> relayReportingBlob;
  Optional<Int> relayServerType;
  List<DrelHoplinePluginAllocation> pluginAllocations;
  Optional<Int> hoplineErrorCode;
  Optional<Int> originalCommand;
  Optional<Bool> isBulkedPayload;
  Optional<Bool> wantsAppAck;
  Optional<String> errorDomain;
  Optional<Bool> expectsPeerResponse;
  Optional<Int> allowGDR;

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

  DrelUserPayload(const DrelUserPayload&) = default;
  DrelUserPayload(DrelUserPayload&&) = default;
  DrelUserPayload& operator=(const DrelUserPayload&) = default;
  DrelUserPayload& operator=(DrelUserPayload&&) = default;
  ~DrelUserPayload() {
    clearFromTheBack(dstIdTokenList);
    clearFromTheBack(corvelMessageList);
  }

 private:
  // Payloads made last are those that the caches still hold: 16 MiB of them are unpacked and
  // destroyed in a sixth less time than from the front.
  static void clearFromTheBack(List<DrelUserPayload>& list) noexcept {
    while (!list.empty()) list.pop_back();
  }
};

}  // namespace ironmoat
