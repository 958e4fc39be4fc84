// SPDX-License-Identifier: Apache-2.0
// Keeps the support library non-empty when no helper file exists yet.
