# Fits one model with lme4 as it comes and writes its answer as JSON: Rscript lme4.R DATA FORMULA ANSWER
arguments <- commandArgs(trailingOnly = TRUE)
suppressMessages(library(lme4))
seconds <- function() proc.time()[["elapsed"]]
began <- seconds()
data <- read.csv(arguments[1], stringsAsFactors = TRUE)
read <- seconds()
fit <- lmer(as.formula(arguments[2]), data, REML = TRUE)
fitted <- seconds()
print(summary(fit, correlation = FALSE))

numbers <- function(x) paste0("[", paste(sprintf("%.17g", x), collapse = ", "), "]")
quoted <- function(x) paste0('"', gsub('["\\\\\n]', " ", x), '"', collapse = ", ")
components <- as.data.frame(VarCorr(fit), order = "lower.tri")
writeLines(paste0(
  '{"criterion": ', sprintf("%.17g", REMLcrit(fit)),
  ', "variances": ', numbers(components$vcov),
  ', "theta": ', numbers(getME(fit, "theta")),
  ', "fixef": ', numbers(fixef(fit)), ', "se": ', numbers(sqrt(diag(as.matrix(vcov(fit))))),
  ', "evaluations": ', fit@optinfo$feval,
  ', "messages": [', if (length(m <- fit@optinfo$conv$lme4$messages)) quoted(unlist(m)), "]",
  ', "version": "lme4 ', as.character(packageVersion("lme4")), '"',
  ', "read": ', read - began, ', "fit": ', fitted - read, "}"), arguments[3])
