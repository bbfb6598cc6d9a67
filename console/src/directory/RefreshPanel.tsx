import { Alert } from '@patternfly/react-core/dist/esm/components/Alert';
import { Button } from '@patternfly/react-core/dist/esm/components/Button';
import { Card, CardBody, CardTitle } from '@patternfly/react-core/dist/esm/components/Card';
import { ExpandableSection } from '@patternfly/react-core/dist/esm/components/ExpandableSection';
import { Progress } from '@patternfly/react-core/dist/esm/components/Progress';
import type { RefreshError, RefreshProgress } from '../api/types';
import { formatDuration, t } from '../texts';
import { ErrorAlert, Loading, useNow } from '../ui';
import { Age } from './list';
import { listsDone, type Result, type Run } from './refresh';
import type { useRefresh } from './useRefresh';

const kShownErrors = 50;

function ErrorList({ errors }: { errors: RefreshError[] }) {
  return (
    <ul className="vorn-refresh__errors">
      {errors.slice(0, kShownErrors).map((error) => (
        <li key={`${error.kind} ${error.domain}`}>
          <strong>
            {t(error.kind === 'group' ? 'refresh.groupsOf' : 'refresh.usersOf', { domain: error.domain })}
          </strong>
          : {error.reason}
        </li>
      ))}
      {errors.length > kShownErrors && (
        <li>{t('refresh.errors.more', { count: errors.length - kShownErrors })}</li>
      )}
    </ul>
  );
}

function Running({ run, progress }: { run: Run; progress: RefreshProgress | null }) {
  const now = useNow(1000);
  // Until the first list is begun the progress is that of an earlier refresh.
  const current = progress?.running === true && progress.domain !== '' ? progress : null;
  const what =
    current === null
      ? t('refresh.beginning')
      : t(current.kind === 'group' ? 'refresh.fetching.groups' : 'refresh.fetching.users', {
          domain: current.domain,
        });
  const lists = current === null ? null : listsDone(current);
  return (
    <>
      {/* Read out when another list is begun, not at each count. */}
      <p role="status" className="pf-v6-screen-reader">
        {what}
      </p>
      <Progress
        id="refresh"
        aria-label={t('refresh.running')}
        title={what}
        measureLocation="outside"
        value={lists === null || lists.all === 0 ? 0 : (lists.done / lists.all) * 100}
        label={lists === null ? '' : t('refresh.lists', lists)}
        valueText={lists === null ? what : t('refresh.lists', lists)}
      />
      <p className="vorn-refresh__facts">
        {current !== null && (
          <span>
            {t(current.kind === 'group' ? 'refresh.count.groups' : 'refresh.count.users', {
              count: current.count,
            })}
          </span>
        )}
        {current !== null && current.domains > 1 && (
          <span>
            {t('refresh.domain', {
              number: Math.min(current.domains_done + 1, current.domains),
              all: current.domains,
            })}
          </span>
        )}
        <span>{t('refresh.since', { time: formatDuration(Math.max(0, now - run.since * 1000)) })}</span>
      </p>
      {run.errors.length > 0 && (
        <ExpandableSection toggleText={t('refresh.errors', { count: run.errors.length })}>
          <ErrorList errors={run.errors} />
        </ExpandableSection>
      )}
    </>
  );
}

function ResultAlert({ result }: { result: Result }) {
  if (result.outcome === 'failed') {
    return (
      <ErrorAlert
        error={result.error}
        details={result.errors.length > 0 ? <ErrorList errors={result.errors} /> : undefined}
      />
    );
  }
  const partly = result.outcome === 'done' && result.errors.length > 0;
  const title =
    result.outcome === 'stopped'
      ? t('refresh.stopped')
      : partly
        ? t('refresh.partly', { count: result.errors.length })
        : t('refresh.done');
  return (
    <Alert
      isInline
      variant={result.outcome === 'stopped' ? 'info' : partly ? 'warning' : 'success'}
      component="h3"
      title={title}
    >
      {partly && <ErrorList errors={result.errors} />}
      {result.outcome === 'stopped' && t('refresh.stopped.body')}
    </Alert>
  );
}

interface RefreshPanelProps {
  refresh: ReturnType<typeof useRefresh>;
  // The domain that is chosen, and why it can't be refreshed by itself.
  domain: string;
  forbidden: string | null;
}

// A refresh of the lists: its start, how far it is, its end.
export function RefreshPanel({ refresh, domain, forbidden }: RefreshPanelProps) {
  const { running, result, progress, start, stop } = refresh;
  const last =
    running === null && result === null && progress !== null && !progress.running ? progress : null;
  const goesOn = running !== null && stop.data === 'goesOn';
  return (
    <Card isCompact className="vorn-refresh">
      <CardTitle component="h2">{t('refresh.title')}</CardTitle>
      <CardBody>
        {refresh.joinedIn && (
          <div role="status">
            <Alert isInline variant="info" component="h3" title={t('refresh.already')}>
              {t('refresh.already.body')}
            </Alert>
          </div>
        )}
        {start.error !== undefined && <ErrorAlert error={start.error} title={t('refresh.notStarted')} />}
        {stop.error !== undefined && <ErrorAlert error={stop.error} title={t('refresh.notStopped')} />}
        {refresh.error !== undefined && (
          <ErrorAlert error={refresh.error} title={t('refresh.unknown')} onRetry={refresh.retry} />
        )}
        {running !== null && <Running run={running} progress={progress} />}
        <div role="status">
          {goesOn && (
            <Alert isInline variant="warning" component="h3" title={t('refresh.goesOn')}>
              {t('refresh.goesOn.body')}
            </Alert>
          )}
          {running === null && stop.data === 'ended' && (
            <Alert isInline variant="info" component="h3" title={t('refresh.ended')} />
          )}
          {result !== null && stop.data !== 'ended' && result.outcome !== 'failed' && (
            <ResultAlert result={stop.data === 'stopped' ? { outcome: 'stopped', at: result.at } : result} />
          )}
        </div>
        {result?.outcome === 'failed' && <ResultAlert result={result} />}
        {last !== null && (
          <div className="vorn-refresh__last">
            <p>
              {t('refresh.last')} <Age seconds={last.updated} />
            </p>
            {last.errors.length > 0 && (
              <ExpandableSection toggleText={t('refresh.errors', { count: last.errors.length })}>
                <ErrorList errors={last.errors} />
              </ExpandableSection>
            )}
          </div>
        )}
        <div className="vorn-refresh__actions">
          {running === null ? (
            <>
              <Button
                variant="primary"
                isLoading={start.busy}
                isAriaDisabled={start.busy}
                onClick={() => void start.run(null)}
              >
                {t('refresh.all')}
              </Button>
              <Button
                variant="secondary"
                isAriaDisabled={start.busy || forbidden !== null}
                aria-describedby={forbidden === null ? undefined : 'refresh-forbidden'}
                onClick={() => void start.run(domain)}
              >
                {t('refresh.one', { domain })}
              </Button>
              {forbidden !== null && (
                <span id="refresh-forbidden" className="vorn-list__subtle">
                  {forbidden}
                </span>
              )}
            </>
          ) : (
            <Button
              variant="secondary"
              isDanger
              isLoading={stop.busy}
              isAriaDisabled={stop.busy}
              onClick={() => void stop.run()}
            >
              {t('refresh.stop')}
            </Button>
          )}
          {stop.busy && <Loading inline text={t('refresh.stopping')} />}
        </div>
      </CardBody>
    </Card>
  );
}
