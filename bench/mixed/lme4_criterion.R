# The REML criterion that lme4 computes at given parameters: Rscript lme4_criterion.R DATA FORMULA THETA...
arguments <- commandArgs(trailingOnly = TRUE)
suppressMessages(library(lme4))
data <- read.csv(arguments[1], stringsAsFactors = TRUE)
criterion <- lmer(as.formula(arguments[2]), data, REML = TRUE, devFunOnly = TRUE)
cat(sprintf("%.17g\n", criterion(as.numeric(arguments[-(1:2)]))))
