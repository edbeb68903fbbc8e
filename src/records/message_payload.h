#pragma once

#include <cstddef>

#include "ironmoat/sparse_field.h"
#include "ironmoat/values.h"
#include "records/keyed_record.h"
#include "records/payload_parts.h"
#include "records/web_tunnel.h"

namespace ironmoat {

/// A message payload, as it comes: a top-level record, and the element of its own two lists.
struct VeskCorvelProtocolPayload : detail::SparseValues {
  using CodingKeys = records::CodingKeys<VeskCorvelProtocolPayload>;

  using Sparse = VeskCorvelProtocolPayload;
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
  Optional<VeskCorvelProtocolDeliveryContext> deliveryContext;
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
  IRONMOAT_SPARSE(Int64) epochTimeNanos;
  IRONMOAT_SPARSE(Int64) originalEpochTimeNanos;
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
  Optional<List<VeskCorvelProtocolPayload>> dstIdTokenList;
  Optional<List<VeskCorvelProtocolPayload>> corvelMessageList;
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
  IRONMOAT_SPARSE(Int) dommelDeliveryStatus;
  IRONMOAT_SPARSE(String) dommelReportId;
  IRONMOAT_SPARSE(Int) retryCount;
  IRONMOAT_SPARSE(String) testOptions;
  IRONMOAT_SPARSE(Int) fanoutChunkNumber;
  IRONMOAT_SPARSE(Bool) fanoutLastChunk;
  IRONMOAT_SPARSE(String) url;
  IRONMOAT_SPARSE(Int) parloRetryCount;
  IRONMOAT_SPARSE(Int) webtunnelVersion;
  IRONMOAT_SPARSE(String) httpUrl;
  Optional<VeskCorvelProtocolHttpHeaders> httpHeaders;
  IRONMOAT_SPARSE(Data) httpBody;
  IRONMOAT_SPARSE(String) httpBodyUrl;
  IRONMOAT_SPARSE(Data) httpBodyKey;
  IRONMOAT_SPARSE(Int) httpResponseStatus;
  IRONMOAT_SPARSE(String) httpErrorMsg;
  IRONMOAT_SPARSE(Bool) writeToNimbra;
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
  IRONMOAT_SPARSE(Data) prevRelayIp;
  IRONMOAT_SPARSE(Int) prevTimestamp;
  IRONMOAT_SPARSE(Data) activeAccessToken;
  IRONMOAT_SPARSE(Data) activeRelayIp;
  IRONMOAT_SPARSE(Int) selfAllocTokenCountOld;
  IRONMOAT_SPARSE(Int) selfAllocTokenCount;
  Optional<List<VeskHoplinePluginRequest>> pluginRequests;
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
  IRONMOAT_SPARSE(Data) relayIp;
  IRONMOAT_SPARSE(Data) relayIpv6;
  IRONMOAT_SPARSE(Int) relayPort;
  IRONMOAT_SPARSE(Data) relayAccessToken;
  IRONMOAT_SPARSE(Data) relaySessionKey;
  IRONMOAT_SPARSE(Data) relaySessionId;
  IRONMOAT_SPARSE(Int64) expiryEpochTimeMillis;
  IRONMOAT_SPARSE(Data) initiatorIp;
  IRONMOAT_SPARSE(Int64) participantId;
  IRONMOAT_SPARSE(Data) softwareVersion;
  IRONMOAT_SPARSE(String) relayBuildVersion;
  IRONMOAT_SPARSE(Int64) allocationEpochTimeMillis;
  IRONMOAT_SPARSE(Int) allocationStatus;
  Optional<List<VeskHoplineAllocationStatus>> allocationStatuses;
  Optional<List<VeskHoplineSelfAllocToken>> selfAllocTokenList;
  IRONMOAT_SPARSE(Data) relayReportingBlob;
  IRONMOAT_SPARSE(Int) relayServerType;
  Optional<List<VeskHoplinePluginAllocation>> pluginAllocations;
  IRONMOAT_SPARSE(Int) hoplineErrorCode;
  IRONMOAT_SPARSE(Int) originalCommand;
  IRONMOAT_SPARSE(Bool) isBulkedPayload;
  IRONMOAT_SPARSE(Bool) wantsAppAck;
  IRONMOAT_SPARSE(String) errorDomain;
  IRONMOAT_SPARSE(Bool) expectsPeerResponse;
  IRONMOAT_SPARSE(Int) allowGDR;

  [[nodiscard]] bool decode(const plist::Decoder& decoder);
  void encode(plist::Encoder& encoder) const;
};

template <>
struct records::Table<VeskCorvelProtocolPayload> {
  using R = VeskCorvelProtocolPayload;
  static constexpr KeyTable rows{
      row<&R::command>("c"),
      row<&R::commandContext>("cc"),
      row<&R::version>("v"),
      row<&R::payload>("P"),
      row<&R::bulkedPayload>("N"),
      row<&R::fanoutPayload>("fP"),
      row<&R::additionalPayload>("aP"),
      row<&R::payloadMetadata>("Pm"),
      row<&R::messageId>("i"),
      row<&R::messageUUID>("U"),
      row<&R::queueId>("qI"),
      row<&R::deliveryStatus>("D"),
      row<&R::deliveryContext>("Dc"),
      row<&R::certifiedDeliveryVersion>("cdv"),
      row<&R::certifiedDeliveryRts>("cdr"),
      row<&R::noResponseNeeded>("nr"),
      row<&R::generateDeliveryReceipt>("gd"),
      row<&R::sessionToken>("sT"),
      row<&R::dommelSessionToken>("hT"),
      row<&R::destinationId>("tP"),
      row<&R::userAgent>("ua"),
      row<&R::KibbOwnerId>("mO"),
      row<&R::KibbFileSignature>("mS"),
      row<&R::KibbFileLength>("mL"),
      row<&R::KibbAuthToken>("mA"),
      row<&R::KibbAuthUrl>("mR"),
      row<&R::KibbAuthId>("mU"),
      row<&R::KibbDownloadAuthList>("dal"),
      row<&R::KibbDownloadUrlList>("dul"),
      row<&R::KibbDownloadUrl>("dR"),
      row<&R::KibbUploadUrl>("uR"),
      row<&R::KibbExpiryNanos>("mX"),
      row<&R::contentVersion>("cV"),
      row<&R::contentHeaders>("cH"),
      row<&R::contentBody>("cB"),
      row<&R::contentReferenceSignature>("cR"),
      row<&R::attachmentSize>("mT"),
      row<&R::token>("t"),
      row<&R::senderId>("sP"),
      row<&R::senderOpaqueId>("sI"),
      row<&R::mspId>("mP"),
      row<&R::responseStatus>("s"),
      row<&R::epochTimeNanos>("e"),
      row<&R::originalEpochTimeNanos>("oe"),
      row<&R::failReason>("fR"),
      row<&R::failMessageId>("fU"),
      row<&R::failMessageIdString>("fM"),
      row<&R::failDownloadAttachmentSize>("fFS"),
      row<&R::failUploadAttachmentSize>("fS"),
      row<&R::failReasonMessage>("fRM"),
      row<&R::failTimeElapsed>("fTE"),
      row<&R::encryptionType>("E"),
      row<&R::storageFlags>("H"),
      row<&R::priority>("pri"),
      row<&R::senderExpectsAck>("ack"),
      row<&R::dstIdTokenList>("dtl"),
      row<&R::corvelMessageList>("mml"),
      row<&R::storageCheckVersion>("scv"),
      row<&R::dateExpirationSeconds>("eX"),
      row<&R::corvelProtocol>("xp"),
      row<&R::internalBuild>("x-internal"),
      row<&R::loggingProfile>("x-logging"),
      row<&R::traceProfile>("x-trace"),
      row<&R::groupMessage>("gm"),
      row<&R::contentType>("cT"),
      row<&R::adhocServiceOverride>("aS"),
      row<&R::responseIdentifier>("rI"),
      row<&R::responseIdentifierString>("ri"),
      row<&R::strictTransportSecurity>("strict-transport-security"),
      row<&R::traceId>("x-b3-traceid"),
      row<&R::splunkHint>("sh"),
      row<&R::asHttpHeader>("as"),
      row<&R::dommelDeliveryStatus>("hD"),
      row<&R::dommelReportId>("hI"),
      row<&R::retryCount>("rc"),
      row<&R::testOptions>("x-test-opts"),
      row<&R::fanoutChunkNumber>("fcn"),
      row<&R::fanoutLastChunk>("flc"),
      row<&R::url>("url"),
      row<&R::parloRetryCount>("frc"),
      row<&R::webtunnelVersion>("wV"),
      row<&R::httpUrl>("u"),
      row<&R::httpHeaders>("h"),
      row<&R::httpBody>("b"),
      row<&R::httpBodyUrl>("bu"),
      row<&R::httpBodyKey>("bk"),
      row<&R::httpResponseStatus>("hs"),
      row<&R::httpErrorMsg>("hr"),
      row<&R::writeToNimbra>("ck"),
      row<&R::pessimisticCheck>("x-pessimistic"),
      row<&R::unfilteredHeaders>("nH"),
      row<&R::deliveryStatusFlags>("O"),
      row<&R::conferenceURI>("curi"),
      row<&R::selfSessionToken>("sst"),
      row<&R::queryHash>("qH"),
      row<&R::testDropPoint>("x-dp"),
      row<&R::userPlusOne>("up1"),
      row<&R::isInitiatorKey>("is-initiator-key"),
      row<&R::errorCode>("eC"),
      row<&R::messageCheckpoint>("mc"),
      row<&R::conversationId>("ci"),
      row<&R::protocolVersion>("qv"),
      row<&R::applicationId>("qai"),
      row<&R::reason>("qr"),
      row<&R::prevErrorCode>("qpec"),
      row<&R::prevAccessToken>("qpat"),
      row<&R::prevRelayIp>("qpip"),
      row<&R::prevTimestamp>("qpt"),
      row<&R::activeAccessToken>("qaat"),
      row<&R::activeRelayIp>("qaip"),
      row<&R::selfAllocTokenCountOld>("qsatc"),
      row<&R::selfAllocTokenCount>("qsats"),
      row<&R::pluginRequests>("qplr"),
      row<&R::pluginName>("qpln"),
      row<&R::pluginConfig>("qplc"),
      row<&R::pluginStream>("qpls"),
      row<&R::pluginDevMode>("qpld"),
      row<&R::hoplineNewSession>("qns"),
      row<&R::requestType>("qat"),
      row<&R::veskSessionId>("qvesk"),
      row<&R::relayProvider>("qrpr"),
      row<&R::sharedSession>("qrss"),
      row<&R::groupId>("qgid"),
      row<&R::groupMemberCount>("qgmc"),
      row<&R::allocateInfoAttribute>("qia"),
      row<&R::relayIp>("qrip"),
      row<&R::relayIpv6>("qrip6"),
      row<&R::relayPort>("qrp"),
      row<&R::relayAccessToken>("qrst"),
      row<&R::relaySessionKey>("qrsk"),
      row<&R::relaySessionId>("qrsi"),
      row<&R::expiryEpochTimeMillis>("qe"),
      row<&R::initiatorIp>("qsi"),
      row<&R::participantId>("qri"),
      row<&R::softwareVersion>("qswv"),
      row<&R::relayBuildVersion>("qrbv"),
      row<&R::allocationEpochTimeMillis>("qsat"),
      row<&R::allocationStatus>("qrs"),
      row<&R::allocationStatuses>("qal"),
      row<&R::selfAllocTokenList>("qsatv"),
      row<&R::relayReportingBlob>("qrep"),
      row<&R::relayServerType>("qrast"),
      row<&R::pluginAllocations>("qpla"),
      row<&R::hoplineErrorCode>("qec"),
      row<&R::originalCommand>("oC"),
      row<&R::isBulkedPayload>("iB"),
      row<&R::wantsAppAck>("wA"),
      row<&R::errorDomain>("eD"),
      row<&R::expectsPeerResponse>("eR"),
      row<&R::allowGDR>("gdr"),
  };
};

}  // namespace ironmoat
