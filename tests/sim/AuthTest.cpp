#include "sim/Auth.h"

#include <gtest/gtest.h>

namespace kyn::sim {
namespace {

TEST(AuthTest, OnlyThePersonWithTheTokenIsAuthorised) {
  const Authoriser auth("1000000001", "s3cret");
  EXPECT_TRUE(auth.authorises("Basic MTAwMDAwMDAwMTpzM2NyZXQ="));     // 1000000001:s3cret
  EXPECT_FALSE(auth.authorises(std::nullopt));
  EXPECT_FALSE(auth.authorises("Basic MTAwMDAwMDAwMTpzM2NyZXQx"));    // 1000000001:s3cret1
  EXPECT_FALSE(auth.authorises("Basic MTAwMDAwMDAwMTpzM2NyZQ=="));    // 1000000001:s3cre
  EXPECT_FALSE(auth.authorises("Basic MTAwMDAwMDAwMjpzM2NyZXQ="));    // 1000000002:s3cret
  EXPECT_FALSE(auth.authorises("Basic OnMzY3JldA=="));                // :s3cret
  EXPECT_FALSE(auth.authorises("Bearer s3cret"));
}

TEST(AuthTest, EachTokenSignsInItsOwnAccountOnly) {
  Authoriser auth("1000000001", "s3cret");
  auth.add("1000000002", "0ther");
  auth.add("1000000003", std::nullopt);  // no token: cannot sign in, not even with an empty one
  EXPECT_EQ(auth.account("Basic MTAwMDAwMDAwMTpzM2NyZXQ="), 0u);  // 1000000001:s3cret
  EXPECT_EQ(auth.account("Basic MTAwMDAwMDAwMjowdGhlcg=="), 1u);  // 1000000002:0ther
  EXPECT_FALSE(auth.account("Basic MTAwMDAwMDAwMTowdGhlcg=="));   // 1000000001:0ther
  EXPECT_FALSE(auth.account("Basic MTAwMDAwMDAwMjpzM2NyZXQ="));   // 1000000002:s3cret
  EXPECT_FALSE(auth.account("Basic MTAwMDAwMDAwMzo="));           // 1000000003:
}

}  // namespace
}  // namespace kyn::sim
